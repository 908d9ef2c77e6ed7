// SPDX-License-Identifier: Apache-2.0
// Each call that a scheduler-group operation makes is made to fail in turn: what is thrown, what
// the kernel is left with, and that no list is lost.
#include "sched_fixture.h"

namespace Test {
namespace {

constexpr const char *kGroupsBefore =
    "host mem 0 -1 -1 -3 cpu 0 -1 -1 -3\n"
    "host/opt mem 0 -1 -1 -3 cpu 0 -1 -1 -3\n";

class SchedFaults : public Sched {
 protected:
  // What OPERATION throws when its NTH kernel call fails with status 0x0bad0001.
  std::string whatWhenCallFails(int nth, const std::function<void()> &operation) {
    writeFile(world.environment.at("RECORDING_KNOB_SCRIPT"),
              "fail status=0x0bad0001 from=" + std::to_string(nth) + "\n");
    std::filesystem::remove(world.environment.at("RECORDING_KNOB_TRACE"));
    nestedWhat.clear();
    const auto failure = failureOf(operation);
    if (!failure) return world.wasInjected() ? "swallowed" : "";
    lastStatus = failure->status;
    return failure->what();
  }

  void expectFailures(const std::function<void()> &operation, const Calls &expected) {
    int nth = 1;
    for (const std::string &what : expected)
      EXPECT_EQ(whatWhenCallFails(nth++, operation), what) << "call " << nth - 1;
    EXPECT_EQ(whatWhenCallFails(nth, operation), "") << "more calls than expected";
  }

  uint32_t lastStatus = 0;
  // A list that can't be made has a status of the program's own, whatever the rule says.
  const std::string noList = "KNOB_ParamListCreate: status 0x0bad0014";
  const std::string noInt = "KNOB_ParamListAddInt: status 0x0bad0001";
  const std::string noString = "KNOB_ParamListAddString: status 0x0bad0001";
  const std::string noSet = "KNOB_Set: status 0x0bad0001";
  const std::string noGet = "KNOB_Get: status 0x0bad0001";
};

TEST_F(SchedFaults, LookUp) {
  expectFailures([] { ::Sched::pathNameToId("host"); }, {noList, noString, noSet});
}

TEST_F(SchedFaults, MemoryRead) {
  ::Sched::MemAllocation record;
  expectFailures([&] { ::Sched::getMemAllocation(2, &record); }, {noList, noInt, noGet});
}

TEST_F(SchedFaults, CpuRead) {
  ::Sched::CpuAllocation record;
  expectFailures([&] { ::Sched::getCpuAllocation(2, &record); }, {noList, noInt, noGet});
}

TEST_F(SchedFaults, MemorySet) {
  expectFailures([] { ::Sched::setMemAllocation(2, mem(1, 2, 3, 4)); },
                 {noList, noList, noInt, noString, noString, noString, noString, noSet});
}

TEST_F(SchedFaults, CpuSetWithoutShares) {
  expectFailures([] { ::Sched::setCpuAllocation(2, cpu(1, 2, -1, 4)); },
                 {noList, noList, noInt, noString, noString, noString, noSet});
}

TEST_F(SchedFaults, Delete) {
  // Refused by the kernel itself when nothing is made to fail: the id belongs to no group.
  const auto operation = [] { ::Sched::deleteGroup(99); };
  EXPECT_EQ(whatWhenCallFails(1, operation), noList);
  EXPECT_EQ(whatWhenCallFails(2, operation), noInt);
  EXPECT_EQ(whatWhenCallFails(3, operation), noSet);
  EXPECT_EQ(whatWhenCallFails(4, operation), "KNOB_Set: status 0x0bad0003");
}

void createPool() {
  ::Sched::createGroup("host/opt/pool", {1, 2, 3, 4, 0}, {1, 2, 3, 4, 0});
}

TEST_F(SchedFaults, CreateFailsPlainlyUntilTheGroupIsMade) {
  const Calls expected{noList, noList, noList, noString, noSet, noInt, noString, noSet};
  for (size_t i = 0; i < expected.size(); ++i) {
    EXPECT_EQ(whatWhenCallFails(static_cast<int>(i) + 1, createPool), expected[i]);
    EXPECT_EQ(nestedWhat, "");
    EXPECT_EQ(world.groups(), kGroupsBefore);
  }
}

TEST_F(SchedFaults, CreateTakesTheGroupBackWhenAnAllocationCannotBeSet) {
  const Calls settings{noList, noList, noInt, noString, noString, noString, noString, noSet};
  Calls nested = settings;  // of memory, then of CPU
  nested.insert(nested.end(), settings.begin(), settings.end());
  int nth = 9;
  for (const std::string &inner : nested) {
    const std::string status = inner.substr(inner.find(": ") + 2);
    EXPECT_EQ(whatWhenCallFails(nth++, createPool), "Initialize host/opt/pool: " + status);
    EXPECT_EQ(lastStatus, std::stoul(status.substr(status.find("0x")), nullptr, 16));
    EXPECT_EQ(nestedWhat, inner);
    EXPECT_EQ(world.groups(), kGroupsBefore);
  }
  EXPECT_EQ(whatWhenCallFails(nth, createPool), "") << "more calls than expected";
}

TEST_F(SchedFaults, EveryStatusButZeroIsAFailure) {
  for (const std::string status :
       {"0x00000001", "0x0bacffff", "0x0bad0000", "0x0bad0001", "0x80000000", "0xffffffff"}) {
    writeFile(world.environment.at("RECORDING_KNOB_SCRIPT"),
              "fail function=KNOB_Set status=" + status + "\n");
    const auto failure = failureOf([] { ::Sched::pathNameToId("host"); });
    ASSERT_TRUE(failure) << status;
    EXPECT_EQ(failure->status, std::stoul(status, nullptr, 16));
    EXPECT_EQ(failure->what(), "KNOB_Set: status " + status);
  }
}

TEST_F(SchedFaults, CreateCarriesTheStatusOfTheRefusedSet) {
  world.knob("fail node=sched_groups_cpuAllocationInPct status=0x0bad00f5");
  const auto failure = failureOf(createPool);
  ASSERT_TRUE(failure);
  EXPECT_EQ(failure->status, 0x0BAD00F5u);
  EXPECT_STREQ(failure->what(), "Initialize host/opt/pool: status 0x0bad00f5");
  EXPECT_EQ(nestedWhat, "KNOB_Set: status 0x0bad00f5");
  EXPECT_EQ(world.groups(), kGroupsBefore);
}

TEST_F(SchedFaults, MemoryThatIsRefusedLeavesTheCpuUnset) {
  world.knob("fail node=sched_groups_memAllocationInMB status=0x0bad00f5");
  failureOf(createPool);
  for (const std::string &call : world.groupCalls())
    EXPECT_EQ(call.find("cpuAllocation"), std::string::npos) << call;
  EXPECT_EQ(world.groupCalls().back(),
            "KNOB_Set sched_groups_delete instance=[101] input=null output=0 -> 0");
}

TEST_F(SchedFaults, ARollbackThatFailsIsReportedInPlaceOfTheRefusal) {
  world.knob("fail node=sched_groups_memAllocationInMB status=0x0bad00f5");
  world.knob("fail node=sched_groups_delete status=0x0bad0004");
  const auto failure = failureOf(createPool);
  ASSERT_TRUE(failure);
  EXPECT_EQ(failure->status, 0x0BAD0004u);
  EXPECT_STREQ(failure->what(), "KNOB_Set: status 0x0bad0004");
  EXPECT_NE(world.groups().find("host/opt/pool"), std::string::npos);
}

}  // namespace
}  // namespace Test
