// SPDX-License-Identifier: Apache-2.0
// The enable command: which groups it makes, which it restores, and which it leaves alone.
#include "cli_fixture.h"
#include "usage_texts.h"

namespace Test {
namespace {

constexpr const char *kEmptyTree =
    "host mem 0 -1 -1 -3 cpu 0 -1 -1 -3\n"
    "host/opt mem 0 -1 -1 -3 cpu 0 -1 -1 -3\n";

class Enable : public CliWithRpD {
 protected:
  void SetUp() override {
    CliWithRpD::SetUp();
    if (IsSkipped()) return;
    world.definition("a.yaml", "- {name: a, memMin: 1, memMax: 2, memMinLimit: 3, memShares: 4}\n");
    world.definition("b.yaml", "- {name: b, memMin: 5, memMax: 6}\n- {name: zero, mem: 0}\n");
  }

  std::string treeWith(const std::string &groups) { return kEmptyTree + groups; }
};

TEST_F(Cli, EnableWithoutNamesIsAUsageError) {
  expectRun(world.poolctl({"enable"}), 1, "", kEnableUsage);
  expectRun(world.poolctl({"enable", "--"}), 1, "", kEnableUsage);
}

TEST_F(Enable, MakesAMissingGroupWithItsCpuSettings) {
  expectRun(world.poolctl({"enable", "host/opt/a"}), 0, "", "");
  EXPECT_EQ(world.groups(), treeWith("host/opt/a mem 1 2 3 4 cpu 0 -1 -1 1000\n"));
  EXPECT_EQ(world.groupCalls().front(),
            "KNOB_Set sched_groupPathNameToID instance=null input=[\"host/opt/a\"] output=8 -> "
            "0x0bad0003");
}

TEST_F(Enable, RestoresTheMemoryOfADisabledGroupAndNotItsCpu) {
  world.knob("group host/opt/a min=0 max=0 minLimit=0 shares=0 cpuMin=7 cpuShares=8");
  expectRun(world.poolctl({"enable", "host/opt/a"}), 0, "", "");
  EXPECT_EQ(world.groupCalls(),
            (Calls{"KNOB_Set sched_groupPathNameToID instance=null input=[\"host/opt/a\"] output=8 "
                   "-> 0",
                   "KNOB_Get sched_groups_memAllocationInMB instance=[11] output=36 -> 0",
                   "KNOB_Set sched_groups_memAllocationInMB instance=[11] "
                   "input=[\"min=1\",\"max=2\",\"minLimit=3\",\"shares=4\"] output=0 -> 0"}));
  EXPECT_EQ(world.groups(), treeWith("host/opt/a mem 1 2 3 4 cpu 7 -1 -1 8\n"));
}

TEST_F(Enable, LeavesSharesThatAreNotDefinedAsTheyAre) {
  world.knob("group host/opt/b min=0 max=0 minLimit=0 shares=0");
  expectRun(world.poolctl({"enable", "host/opt/b"}), 0, "", "");
  EXPECT_EQ(world.groups(), treeWith("host/opt/b mem 5 6 -1 0 cpu 0 -1 -1 -3\n"));
}

TEST_F(Enable, RestoresAPoolThatDefinesNoMaximum) {
  world.definition("c.yaml", "- {name: c, memMin: 1}\n");
  world.knob("group host/opt/c min=0 max=0 minLimit=0 shares=0");
  expectRun(world.poolctl({"enable", "host/opt/c"}), 0, "", "");
  EXPECT_EQ(world.groups(), treeWith("host/opt/c mem 1 -1 -1 0 cpu 0 -1 -1 -3\n"));
}

TEST_F(Enable, LeavesAGroupWithAMaximumAsItIs) {
  world.knob("group host/opt/a min=8 max=9");
  expectRun(world.poolctl({"enable", "host/opt/a"}), 0, "", "");
  EXPECT_EQ(world.groups(), treeWith("host/opt/a mem 8 9 -1 -3 cpu 0 -1 -1 -3\n"));
}

TEST_F(Enable, LeavesAGroupWithoutALimitAsItIs) {
  world.knob("group host/opt/a max=-1");
  expectRun(world.poolctl({"enable", "host/opt/a"}), 0, "", "");
  EXPECT_EQ(world.groupCalls().size(), 2u);
}

TEST_F(Enable, RestoresNothingWhenTheDefinitionsMaximumIsZero) {
  world.knob("group host/opt/zero min=0 max=0 minLimit=0 shares=7");
  expectRun(world.poolctl({"enable", "host/opt/zero"}), 0, "", "");
  EXPECT_EQ(world.groupCalls().size(), 2u);
  EXPECT_EQ(world.groups(), treeWith("host/opt/zero mem 0 0 0 7 cpu 0 -1 -1 -3\n"));
}

TEST_F(Enable, TakesAPoolThatIsNotEnabledByItself) {
  world.definition("c.yaml", "- {name: c, isEnabled: no}\n");
  expectRun(world.poolctl({"enable", "host/opt/c"}), 0, "", "");
  EXPECT_NE(world.groups().find("host/opt/c "), std::string::npos);
}

TEST_F(Enable, KnowsAPoolByItsFullPathAlone) {
  expectRun(world.poolctl({"enable", "a"}), 1, "", "a not found\n");
  expectRun(world.poolctl({"enable", "host/opt/a/"}), 1, "", "host/opt/a/ not found\n");
}

TEST_F(Enable, HandlesTheNamesBeforeAnUndefinedOneAndNoneBehindIt) {
  expectRun(world.poolctl({"enable", "host/opt/b", "none", "host/opt/a"}), 1, "",
            "none not found\n");
  EXPECT_EQ(world.groups(), treeWith("host/opt/b mem 5 6 -1 -3 cpu 0 -1 -1 1000\n"));
}

TEST_F(Enable, FailsBeforeAnyPoolWhenAnyDefinitionIsBad) {
  world.definition("z.yaml", "- z\n");
  expectRun(world.poolctl({"enable", "host/opt/a"}), 1, "",
            "/etc/rp.d/z.yaml: line 1 column 3: expected a map\n");
  EXPECT_EQ(world.groupCalls(), Calls{});
}

TEST_F(Enable, UsesTheFirstOfTwoDefinitionsOfOneName) {
  world.definition("c.yaml", "- {name: c, memMax: 7}\n- {name: c, memMax: 7}\n");
  expectRun(world.poolctl({"enable", "host/opt/c"}), 0, "", "");
  EXPECT_EQ(world.groups(), treeWith("host/opt/c mem 0 7 -1 -3 cpu 0 -1 -1 1000\n"));
}

TEST_F(Enable, GivesUpWhenTheGroupCannotBeMade) {
  world.knob("fail node=sched_groups_groupCreate status=0x0bad00f5");
  expectRun(world.poolctl({"enable", "host/opt/a", "host/opt/b"}), 1, "",
            "KNOB_Set: status 0x0bad00f5\n");
  EXPECT_EQ(world.groups(), kEmptyTree);
}

TEST_F(Enable, GivesUpWhenAnAllocationOfANewGroupIsRefused) {
  world.knob("fail node=sched_groups_cpuAllocationInPct status=0x0bad00f5");
  expectRun(world.poolctl({"enable", "host/opt/a"}), 1, "",
            "Initialize host/opt/a: status 0x0bad00f5\n");
  EXPECT_EQ(world.groups(), kEmptyTree);
}

struct FailingCall {
  const char *name, *rule, *what;
};

class EnableFailure : public testing::TestWithParam<FailingCall> {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ETC();
    world.definition("a.yaml", "- {name: a, mem: 3}\n- {name: b, mem: 4}\n");
    world.knob("group host/opt/a max=0");
    world.knob("group host/opt/b max=0");
  }

  StandInWorld world;
};

TEST_P(EnableFailure, IsReportedWithTheNameAndTheNextNameIsHandled) {
  world.knob(std::string("fail group=host/opt/a ") + GetParam().rule + " status=0x0bad0001");
  expectRun(world.poolctl({"enable", "host/opt/a", "host/opt/b"}), 0, "",
            std::string("host/opt/a: ") + GetParam().what + ": status 0x0bad0001\n");
  EXPECT_EQ(world.groups(), std::string(kEmptyTree) +
                                "host/opt/a mem 0 0 -1 -3 cpu 0 -1 -1 -3\n"
                                "host/opt/b mem 4 4 -1 -3 cpu 0 -1 -1 -3\n");
}

TEST_P(EnableFailure, ThatTheGroupIsGoneMakesItAfresh) {
  world.knob(std::string("fail group=host/opt/a ") + GetParam().rule + " status=0x0bad0003");
  // The model still has the group: its answer to the creation shows that it was asked for.
  expectRun(world.poolctl({"enable", "host/opt/a"}), 1, "", "KNOB_Set: status 0x0bad0005\n");
}

TEST_P(EnableFailure, ThatTheGroupIsBusyIsReportedLikeAnyOther) {
  world.knob(std::string("fail group=host/opt/a ") + GetParam().rule + " status=0x0bad0080");
  expectRun(world.poolctl({"enable", "host/opt/a"}), 0, "",
            std::string("host/opt/a: ") + GetParam().what + ": status 0x0bad0080\n");
}

INSTANTIATE_TEST_SUITE_P(
    AtEachCall, EnableFailure,
    testing::Values(FailingCall{"LookUp", "node=sched_groupPathNameToID", "KNOB_Set"},
                    FailingCall{"Read", "function=KNOB_Get", "KNOB_Get"},
                    FailingCall{"Set", "function=KNOB_Set node=sched_groups_memAllocationInMB",
                                "KNOB_Set"}),
    [](const auto &call) { return std::string(call.param.name); });

}  // namespace
}  // namespace Test
