// SPDX-License-Identifier: Apache-2.0
// The disable command: the three calls for each name, the wait for busy groups, and its reports.
#include "cli_fixture.h"
#include "usage_texts.h"

namespace Test {
namespace {

constexpr const char *kEmptyTree =
    "host mem 0 -1 -1 -3 cpu 0 -1 -1 -3\n"
    "host/opt mem 0 -1 -1 -3 cpu 0 -1 -1 -3\n";

class Disable : public Cli {
 protected:
  void SetUp() override {
    world.knob("group host/opt/a min=1 max=2 minLimit=3 shares=4");
    world.knob("group host/opt/b min=5 max=6");
  }

  // How often the run slept, each time for one millisecond.
  size_t retries() {
    const Calls trace = world.hostTrace();
    for (const std::string &call : trace) EXPECT_EQ(call, "sleep 1000");
    return trace.size();
  }

  void busy(const std::string &status, int count) {
    world.knob("fail node=sched_groups_delete group=host/opt/a status=" + status +
               " count=" + std::to_string(count));
  }
};

TEST_F(Disable, WithoutNamesIsAUsageError) {
  for (const Arguments &arguments :
       {Arguments{"disable"}, Arguments{"disable", "-n"}, Arguments{"disable", "-w", "5"}})
    expectRun(world.poolctl(arguments), 1, "", kDisableUsage);
}

TEST_F(Disable, WithAWaitThatIsNotGivenIsAUsageError) {
  expectRun(world.poolctl({"disable", "host/opt/a", "-w"}), 1, "",
            std::string("disable: option requires an argument -- 'w'\n") + kDisableUsage);
}

TEST_F(Disable, ZeroesTheMemoryAndDeletesTheGroup) {
  expectRun(world.poolctl({"disable", "host/opt/a"}), 0, "", "");
  EXPECT_EQ(world.kernelCalls(),
            (Calls{"KNOB_Set sched_groupPathNameToID instance=null input=[\"host/opt/a\"] output=8 "
                   "-> 0",
                   "KNOB_Set sched_groups_memAllocationInMB instance=[11] "
                   "input=[\"min=0\",\"max=0\",\"minLimit=0\",\"shares=0\"] output=0 -> 0",
                   "KNOB_Set sched_groups_delete instance=[11] input=null output=0 -> 0"}));
  EXPECT_EQ(world.groups(), std::string(kEmptyTree) + "host/opt/b mem 5 6 -1 -3 cpu 0 -1 -1 -3\n");
}

TEST_F(Disable, OnlyDisablesOnRequest) {
  expectRun(world.poolctl({"disable", "-n", "host/opt/a", "host/opt/b"}), 0, "", "");
  EXPECT_EQ(world.groups(), std::string(kEmptyTree) +
                                "host/opt/a mem 0 0 0 0 cpu 0 -1 -1 -3\n"
                                "host/opt/b mem 0 0 0 0 cpu 0 -1 -1 -3\n");
  EXPECT_EQ(world.groupCalls().size(), 4u);
}

TEST_F(Disable, TakesAPathAsItStands) {
  expectRun(world.poolctl({"disable", "a"}), 0, "a: KNOB_Set: status 0x0bad0003\n", "");
  EXPECT_EQ(world.groupCalls(), Calls{"KNOB_Set sched_groupPathNameToID instance=null "
                                      "input=[\"a\"] output=8 -> 0x0bad0003"});
}

TEST_F(Disable, ReportsAMissingGroupOnStandardOutputAndGoesOn) {
  expectRun(world.poolctl({"disable", "host/opt/none", "host/opt/a"}), 0,
            "host/opt/none: KNOB_Set: status 0x0bad0003\n", "");
  EXPECT_EQ(world.groups(), std::string(kEmptyTree) + "host/opt/b mem 5 6 -1 -3 cpu 0 -1 -1 -3\n");
}

TEST_F(Disable, NeedsNoDefinitions) {
  SKIP_WITHOUT_PRIVATE_ETC();
  world.etc();  // without rp.d
  expectRun(world.poolctl({"disable", "host/opt/a"}), 0, "", "");
}

class DisableOfABusyGroup : public Disable, public testing::WithParamInterface<const char *> {};

TEST_P(DisableOfABusyGroup, FailsAtTheFirstAnswerWithoutAWaitAndStopsThere) {
  world.hostCalls();
  busy(GetParam(), 1);
  expectRun(world.poolctl({"disable", "host/opt/a", "host/opt/b"}), 1, "",
            "host/opt/a: status 0x0bad0004\n");
  EXPECT_EQ(retries(), 0u);
  EXPECT_NE(world.groups().find("host/opt/a mem 0 0 0 0 "), std::string::npos);
  EXPECT_NE(world.groups().find("host/opt/b mem 5 6 "), std::string::npos);
}

INSTANTIATE_TEST_SUITE_P(Statuses, DisableOfABusyGroup,
                         testing::Values("0x0bad0004", "0x0bad0080"));

TEST_F(Disable, WaitingRepeatsAllThreeCallsEveryMillisecond) {
  world.hostCalls();
  busy("0x0bad0004", 2);
  expectRun(world.poolctl({"disable", "-w", "1", "host/opt/a"}), 0, "", "");
  EXPECT_EQ(retries(), 2u);
  EXPECT_EQ(world.groupCalls().size(), 9u);
}

TEST_F(Disable, WaitsForMemoryInUseToo) {
  world.hostCalls();
  world.knob("fail node=sched_groups_memAllocationInMB status=0x0bad0080 count=3");
  expectRun(world.poolctl({"disable", "-w", "1", "host/opt/a"}), 0, "", "");
  EXPECT_EQ(retries(), 3u);
}

TEST_F(Disable, WaitOfZeroLastsForTheRestOfTheSecond) {
  world.hostCalls("1000000000.990");
  busy("0x0bad0004", 0);
  expectRun(world.poolctl({"disable", "-w", "0", "host/opt/a"}), 1, "",
            "host/opt/a: status 0x0bad0004\n");
  EXPECT_EQ(retries(), 10u);
}

TEST_F(Disable, WaitLastsUntilTheDeadlinesOwnSecondIsOver) {
  world.hostCalls("1000000000.500");
  busy("0x0bad0080", 0);
  expectRun(world.poolctl({"disable", "-w", "2", "host/opt/a"}), 1, "",
            "host/opt/a: status 0x0bad0004\n");
  EXPECT_EQ(retries(), 2500u);
}

TEST_F(Disable, WaitIsOneBudgetForAllNames) {
  world.hostCalls("1000000000.000");
  busy("0x0bad0004", 1500);
  world.knob("fail node=sched_groups_delete group=host/opt/b status=0x0bad0004 count=0");
  expectRun(world.poolctl({"disable", "-w", "1", "host/opt/a", "host/opt/b"}), 1, "",
            "host/opt/b: status 0x0bad0004\n");
  EXPECT_EQ(retries(), 2000u);
}

TEST_F(Disable, WaitWithoutDigitsIsZeroSeconds) {
  world.hostCalls("1000000000.999");
  busy("0x0bad0004", 0);
  expectRun(world.poolctl({"disable", "-w", "soon", "host/opt/a"}), 1, "",
            "host/opt/a: status 0x0bad0004\n");
  EXPECT_EQ(retries(), 1u);
}

TEST_F(Disable, WaitIgnoresWhatFollowsTheDigits) {
  world.hostCalls("1000000000.000");
  busy("0x0bad0004", 0);
  world.poolctl({"disable", "-w", "1s", "host/opt/a"});
  EXPECT_EQ(retries(), 2000u);
}

TEST_F(Disable, WaitInThePastFailsAtTheFirstBusyAnswer) {
  world.hostCalls();
  busy("0x0bad0004", 0);
  world.poolctl({"disable", "-w", "-1", "host/opt/a"});
  EXPECT_EQ(retries(), 0u);
}

TEST_F(Disable, WaitIsNarrowedToThirtyTwoBits) {
  world.hostCalls("1000000000.000");
  busy("0x0bad0004", 0);
  world.poolctl({"disable", "-w", "4294967297", "host/opt/a"});
  EXPECT_EQ(retries(), 2000u);
}

TEST_F(Disable, TheLastWaitCounts) {
  world.hostCalls("1000000000.000");
  busy("0x0bad0004", 0);
  world.poolctl({"disable", "-w", "9", "-w", "0", "host/opt/a"});
  EXPECT_EQ(retries(), 1000u);
}

TEST_F(Disable, ReportsAnyOtherFailureTwiceAndStops) {
  world.knob("fail node=sched_groups_memAllocationInMB group=host/opt/a status=0x0bad0001");
  expectRun(world.poolctl({"disable", "host/opt/a", "host/opt/b"}), 1, "",
            "host/opt/a: KNOB_Set: status 0x0bad0001\n"
            "KNOB_Set: status 0x0bad0001\n");
  EXPECT_NE(world.groups().find("host/opt/b mem 5 6 "), std::string::npos);
}

TEST_F(Disable, OfAGroupWithChildrenIsBusy) {
  world.knob("group host/opt/a/child");
  expectRun(world.poolctl({"disable", "host/opt/a"}), 1, "", "host/opt/a: status 0x0bad0004\n");
  EXPECT_NE(world.groups().find("host/opt/a mem 0 0 0 0 "), std::string::npos);
}

TEST_F(Disable, AGroupThatVanishesWhileWaitingIsReportedAsMissing) {
  world.hostCalls();
  busy("0x0bad0004", 1);
  world.knob("fail node=sched_groupPathNameToID group=host/opt/a from=2 status=0x0bad0003");
  expectRun(world.poolctl({"disable", "-w", "1", "host/opt/a"}), 0,
            "host/opt/a: KNOB_Set: status 0x0bad0003\n", "");
}

}  // namespace
}  // namespace Test
