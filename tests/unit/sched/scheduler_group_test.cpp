// SPDX-License-Identifier: Apache-2.0
// The exact exchange with the kernel that each scheduler-group operation is.
#include <cstring>

#include "sched_fixture.h"

namespace Test {
namespace {

TEST_F(Sched, LookUpIsASetCallWithAnOutputOfEightBytes) {
  int64_t id = 0;
  succeed([&] { id = ::Sched::pathNameToId("host/opt"); });
  EXPECT_EQ(id, 2);
  EXPECT_EQ(world.everyCall(),
            (Calls{"KNOB_ParamListCreate kind=0 capacity=1 -> #1",
                   "KNOB_ParamListAddString #1 \"host/opt\" -> 0",
                   "KNOB_Set sched_groupPathNameToID instance=null input=[\"host/opt\"] output=8 "
                   "-> 0",
                   "KNOB_ParamListDestroy #1"}));
}

TEST_F(Sched, LookUpOfAnUnknownPathCarriesTheKernelsStatus) {
  const auto failure = failureOf([] { ::Sched::pathNameToId("host/none"); });
  ASSERT_TRUE(failure);
  EXPECT_EQ(failure->status, 0x0BAD0003u);
  EXPECT_STREQ(failure->what(), "KNOB_Set: status 0x0bad0003");
}

TEST_F(Sched, MemoryIsReadIntoTheRecordAsTheKernelWroteIt) {
  world.knob("group host/opt/a min=5 max=4294967296 minLimit=-1 shares=-3");
  ::Sched::MemAllocation record;
  succeed([&] { ::Sched::getMemAllocation(11, &record); });
  EXPECT_EQ(record.min, 5);
  EXPECT_EQ(record.max, 4294967296);
  EXPECT_EQ(record.minLimit, -1);
  EXPECT_EQ(record.shares, -3);
  EXPECT_EQ(record.reserved32, 0xA5A5A5A5u);
  EXPECT_EQ(
      world.everyCall(),
      (Calls{"KNOB_ParamListCreate kind=1 capacity=1 -> #1", "KNOB_ParamListAddInt #1 11 -> 0",
             "KNOB_Get sched_groups_memAllocationInMB instance=[11] output=36 -> 0",
             "KNOB_ParamListDestroy #1"}));
}

TEST_F(Sched, CpuIsReadIntoTheRecordAsTheKernelWroteIt) {
  world.knob("group host/opt/a cpuMin=5 cpuMax=150 cpuMinLimit=7 cpuShares=1000");
  ::Sched::CpuAllocation record;
  succeed([&] { ::Sched::getCpuAllocation(11, &record); });
  EXPECT_EQ(record.min, 5);
  EXPECT_EQ(record.max, 150);
  EXPECT_EQ(record.minLimit, 7);
  EXPECT_EQ(record.shares, 1000);
  EXPECT_EQ(record.reserved16, 0xA5A5A5A5u);
  EXPECT_EQ(
      world.everyCall(),
      (Calls{"KNOB_ParamListCreate kind=1 capacity=1 -> #1", "KNOB_ParamListAddInt #1 11 -> 0",
             "KNOB_Get sched_groups_cpuAllocationInPct instance=[11] output=20 -> 0",
             "KNOB_ParamListDestroy #1"}));
}

TEST_F(Sched, AFailedReadLeavesTheRecordAlone) {
  ::Sched::MemAllocation record = mem(1, 2, 3, 4);
  const auto failure = failureOf([&] { ::Sched::getMemAllocation(99, &record); });
  ASSERT_TRUE(failure);
  EXPECT_STREQ(failure->what(), "KNOB_Get: status 0x0bad0003");
  EXPECT_EQ(record.min, 1);
  EXPECT_EQ(record.max, 2);
}

TEST_F(Sched, MemoryIsSetMinMaxMinLimitThenSharesAndTheInputListGoesFirst) {
  succeed([] { ::Sched::setMemAllocation(2, mem(512, 1024, -3, -1)); });
  EXPECT_EQ(world.everyCall(),
            (Calls{"KNOB_ParamListCreate kind=1 capacity=1 -> #1",
                   "KNOB_ParamListCreate kind=0 capacity=4 -> #2", "KNOB_ParamListAddInt #1 2 -> 0",
                   "KNOB_ParamListAddString #2 \"min=512\" -> 0",
                   "KNOB_ParamListAddString #2 \"max=1024\" -> 0",
                   "KNOB_ParamListAddString #2 \"minLimit=-1\" -> 0",
                   "KNOB_ParamListAddString #2 \"shares=-3\" -> 0",
                   "KNOB_Set sched_groups_memAllocationInMB instance=[2] "
                   "input=[\"min=512\",\"max=1024\",\"minLimit=-1\",\"shares=-3\"] output=0 -> 0",
                   "KNOB_ParamListDestroy #2", "KNOB_ParamListDestroy #1"}));
}

TEST_F(Sched, SharesOfMinusOneAreLeftOutOfAListMadeForFour) {
  succeed([] { ::Sched::setMemAllocation(2, mem(0, -1, -1, -1)); });
  EXPECT_EQ(world.everyCall().at(1), "KNOB_ParamListCreate kind=0 capacity=4 -> #2");
  EXPECT_EQ(world.groupCalls(), Calls{"KNOB_Set sched_groups_memAllocationInMB instance=[2] "
                                      "input=[\"min=0\",\"max=-1\",\"minLimit=-1\"] output=0 "
                                      "-> 0"});
}

TEST_F(Sched, AnAllZeroMemoryRecordSendsItsSharesToo) {
  succeed([] { ::Sched::setMemAllocation(2, mem(0, 0, 0, 0)); });
  EXPECT_EQ(world.groupCalls(),
            Calls{"KNOB_Set sched_groups_memAllocationInMB instance=[2] "
                  "input=[\"min=0\",\"max=0\",\"minLimit=0\",\"shares=0\"] output=0 -> 0"});
}

TEST_F(Sched, SettingsOfMinusOneAreSentButForTheShares) {
  succeed([] {
    ::Sched::setMemAllocation(2, mem(-1, -1, -1, -1));
    ::Sched::setCpuAllocation(2, cpu(-1, -1, -1, -1));
  });
  EXPECT_EQ(world.groupCalls(),
            (Calls{"KNOB_Set sched_groups_memAllocationInMB instance=[2] "
                   "input=[\"min=-1\",\"max=-1\",\"minLimit=-1\"] output=0 -> 0",
                   "KNOB_Set sched_groups_cpuAllocationInPct instance=[2] "
                   "input=[\"min=-1\",\"max=-1\",\"minLimit=-1\"] output=0 -> 0"}));
}

TEST_F(Sched, MemorySettingsKeepTheirSixtyFourBits) {
  succeed([] {
    ::Sched::setMemAllocation(
        2, mem(INT64_MIN, INT64_MAX, -9223372036854775807, -9223372036854775807));
  });
  EXPECT_EQ(world.groupCalls(), Calls{"KNOB_Set sched_groups_memAllocationInMB instance=[2] "
                                      "input=[\"min=-9223372036854775808\","
                                      "\"max=9223372036854775807\","
                                      "\"minLimit=-9223372036854775807\","
                                      "\"shares=-9223372036854775807\"] output=0 -> 0"});
}

TEST_F(Sched, CpuIsSetInTheSameOrder) {
  succeed([] { ::Sched::setCpuAllocation(2, cpu(0, -1, 1000, -1)); });
  EXPECT_EQ(world.everyCall(),
            (Calls{"KNOB_ParamListCreate kind=1 capacity=1 -> #1",
                   "KNOB_ParamListCreate kind=0 capacity=4 -> #2", "KNOB_ParamListAddInt #1 2 -> 0",
                   "KNOB_ParamListAddString #2 \"min=0\" -> 0",
                   "KNOB_ParamListAddString #2 \"max=-1\" -> 0",
                   "KNOB_ParamListAddString #2 \"minLimit=-1\" -> 0",
                   "KNOB_ParamListAddString #2 \"shares=1000\" -> 0",
                   "KNOB_Set sched_groups_cpuAllocationInPct instance=[2] "
                   "input=[\"min=0\",\"max=-1\",\"minLimit=-1\",\"shares=1000\"] output=0 -> 0",
                   "KNOB_ParamListDestroy #2", "KNOB_ParamListDestroy #1"}));
}

TEST_F(Sched, CpuSharesOfMinusOneAreLeftOutAndOfMinusFourSent) {
  succeed([] {
    ::Sched::setCpuAllocation(2, cpu(INT32_MIN, 5, -1, 6));
    ::Sched::setCpuAllocation(2, cpu(1, INT32_MAX, -4, 6));
  });
  EXPECT_EQ(world.groupCalls(),
            (Calls{"KNOB_Set sched_groups_cpuAllocationInPct instance=[2] "
                   "input=[\"min=-2147483648\",\"max=5\",\"minLimit=6\"] output=0 -> 0",
                   "KNOB_Set sched_groups_cpuAllocationInPct instance=[2] "
                   "input=[\"min=1\",\"max=2147483647\",\"minLimit=6\",\"shares=-4\"] output=0 "
                   "-> 0"}));
}

TEST_F(Sched, DeleteSendsNeitherInputNorOutput) {
  world.knob("group host/opt/a");
  succeed([] { ::Sched::deleteGroup(11); });
  EXPECT_EQ(
      world.everyCall(),
      (Calls{"KNOB_ParamListCreate kind=1 capacity=1 -> #1", "KNOB_ParamListAddInt #1 11 -> 0",
             "KNOB_Set sched_groups_delete instance=[11] input=null output=0 -> 0",
             "KNOB_ParamListDestroy #1"}));
}

TEST_F(Sched, CreateLooksTheParentUpWithBothListsMadeAndThenSetsMemoryAndCpu) {
  succeed(
      [] { ::Sched::createGroup("host/opt/pool", mem(512, -1, -1, -1), cpu(0, -1, 1000, -1)); });
  EXPECT_EQ(
      world.everyCall(),
      (Calls{"KNOB_ParamListCreate kind=1 capacity=1 -> #1",
             "KNOB_ParamListCreate kind=0 capacity=1 -> #2",
             "KNOB_ParamListCreate kind=0 capacity=1 -> #3",
             "KNOB_ParamListAddString #3 \"host/opt\" -> 0",
             "KNOB_Set sched_groupPathNameToID instance=null input=[\"host/opt\"] output=8 -> 0",
             "KNOB_ParamListDestroy #3",
             "KNOB_ParamListAddInt #1 2 -> 0",
             "KNOB_ParamListAddString #2 \"pool\" -> 0",
             "KNOB_Set sched_groups_groupCreate instance=[2] input=[\"pool\"] output=8 -> 0",
             "KNOB_ParamListCreate kind=1 capacity=1 -> #4",
             "KNOB_ParamListCreate kind=0 capacity=4 -> #5",
             "KNOB_ParamListAddInt #4 101 -> 0",
             "KNOB_ParamListAddString #5 \"min=512\" -> 0",
             "KNOB_ParamListAddString #5 \"max=-1\" -> 0",
             "KNOB_ParamListAddString #5 \"minLimit=-1\" -> 0",
             "KNOB_Set sched_groups_memAllocationInMB instance=[101] "
             "input=[\"min=512\",\"max=-1\",\"minLimit=-1\"] output=0 -> 0",
             "KNOB_ParamListDestroy #5",
             "KNOB_ParamListDestroy #4",
             "KNOB_ParamListCreate kind=1 capacity=1 -> #6",
             "KNOB_ParamListCreate kind=0 capacity=4 -> #7",
             "KNOB_ParamListAddInt #6 101 -> 0",
             "KNOB_ParamListAddString #7 \"min=0\" -> 0",
             "KNOB_ParamListAddString #7 \"max=-1\" -> 0",
             "KNOB_ParamListAddString #7 \"minLimit=-1\" -> 0",
             "KNOB_ParamListAddString #7 \"shares=1000\" -> 0",
             "KNOB_Set sched_groups_cpuAllocationInPct instance=[101] "
             "input=[\"min=0\",\"max=-1\",\"minLimit=-1\",\"shares=1000\"] output=0 -> 0",
             "KNOB_ParamListDestroy #7",
             "KNOB_ParamListDestroy #6",
             "KNOB_ParamListDestroy #2",
             "KNOB_ParamListDestroy #1"}));
}

TEST_F(Sched, CreateOfAPathWithoutASlashLooksTheEmptyPathUp) {
  const auto failure =
      failureOf([] { ::Sched::createGroup("pool", mem(0, -1, -1, -1), cpu(0, -1, -1, -1)); });
  ASSERT_TRUE(failure);
  EXPECT_STREQ(failure->what(), "KNOB_Set: status 0x0bad0003");
  EXPECT_EQ(world.groupCalls(), Calls{"KNOB_Set sched_groupPathNameToID instance=null "
                                      "input=[\"\"] output=8 -> 0x0bad0003"});
}

TEST_F(Sched, CreateOfAPathThatEndsInASlashSendsAnEmptyName) {
  world.knob("fail node=sched_groups_groupCreate status=0x0bad0007");
  const auto failure =
      failureOf([] { ::Sched::createGroup("host/opt/", mem(0, -1, -1, -1), cpu(0, -1, -1, -1)); });
  ASSERT_TRUE(failure);
  EXPECT_STREQ(failure->what(), "KNOB_Set: status 0x0bad0007");
  EXPECT_EQ(world.groupCalls().back(),
            "KNOB_Set sched_groups_groupCreate instance=[2] input=[\"\"] output=8 "
            "-> 0x0bad0007 (injected)");
}

TEST_F(Sched, CreateOfAnExistingGroupIsAPlainFailure) {
  world.knob("group host/opt/a min=5");
  const auto failure =
      failureOf([] { ::Sched::createGroup("host/opt/a", mem(9, -1, -1, -1), cpu(0, -1, -1, -1)); });
  ASSERT_TRUE(failure);
  EXPECT_EQ(failure->status, 0x0BAD0005u);
  EXPECT_STREQ(failure->what(), "KNOB_Set: status 0x0bad0005");
  EXPECT_EQ(nestedWhat, "");
  EXPECT_NE(world.groups().find("host/opt/a mem 5 -1 -1 -3"), std::string::npos);
}

TEST_F(Sched, ExceptionJoinsTheLeadingTextAndTheKernelsText) {
  const ::Sched::Exception e("host/opt/a", 0x0BAD0004);
  EXPECT_STREQ(e.what(), "host/opt/a: status 0x0bad0004");
  EXPECT_EQ(e.status, 0x0BAD0004u);
}

TEST(SchedRecords, LieByteForByteAsTheKernelsNodes) {
  unsigned char bytes[36];
  for (unsigned char i = 0; i < sizeof bytes; ++i) bytes[i] = i;
  ::Sched::MemAllocation memory;
  ::Sched::CpuAllocation processor;
  std::memcpy(&memory, bytes, sizeof memory);
  std::memcpy(&processor, bytes, sizeof processor);
  EXPECT_EQ(memory.shares, 0x1716151413121110);
  EXPECT_EQ(memory.minLimit, 0x1f1e1d1c1b1a1918);
  EXPECT_EQ(processor.shares, 0x0b0a0908);
  EXPECT_EQ(processor.minLimit, 0x0f0e0d0c);
}

}  // namespace
}  // namespace Test
