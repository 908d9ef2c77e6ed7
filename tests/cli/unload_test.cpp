// SPDX-License-Identifier: Apache-2.0
// The unload command: what it deletes, and how it makes groups again when it cannot go on.
#include "cli_fixture.h"

namespace Test {
namespace {

constexpr const char *kEmptyTree =
    "host mem 0 -1 -1 -3 cpu 0 -1 -1 -3\n"
    "host/opt mem 0 -1 -1 -3 cpu 0 -1 -1 -3\n";

class Unload : public Cli {
 protected:
  // The paths that the run looked up, in order.
  Calls lookedUp() {
    Calls result;
    const std::string begin = "KNOB_Set sched_groupPathNameToID instance=null input=[\"";
    for (const std::string &call : world.groupCalls()) {
      if (call.compare(0, begin.size(), begin) == 0)
        result.push_back(call.substr(begin.size(), call.find("\"]") - begin.size()));
    }
    return result;
  }

  std::string abc() { return world.file("abc.yaml", "- name: a\n- name: b\n- name: c\n"); }

  void threeGroups() {
    world.knob("group host/opt/a min=1 max=2 minLimit=3 shares=4");
    world.knob("group host/opt/b min=5 cpuMin=6 cpuMax=7 cpuMinLimit=8 cpuShares=9");
    world.knob("group host/opt/c shares=-1 cpuShares=-4");
  }

  const std::string threeLines =
      "host/opt/a mem 1 2 3 4 cpu 0 -1 -1 -3\n"
      "host/opt/b mem 5 -1 -1 -3 cpu 6 7 8 9\n";
};

class UnloadRpD : public CliWithRpD {};

TEST_F(Unload, ReadsTheLiveSettingsBeforeItDeletes) {
  world.knob("group host/opt/a min=1");
  expectRun(world.poolctl({"unload", world.file("a.yaml", "- name: a\n")}), 0, "", "");
  EXPECT_EQ(world.groupCalls(),
            (Calls{"KNOB_Set sched_groupPathNameToID instance=null input=[\"host/opt/a\"] output=8 "
                   "-> 0",
                   "KNOB_Get sched_groups_memAllocationInMB instance=[11] output=36 -> 0",
                   "KNOB_Get sched_groups_cpuAllocationInPct instance=[11] output=20 -> 0",
                   "KNOB_Set sched_groups_delete instance=[11] input=null output=0 -> 0"}));
  EXPECT_EQ(world.groups(), kEmptyTree);
}

TEST_F(Unload, DeletesChildrenBeforeTheirParents) {
  for (const char *path : {"host/opt/a", "host/opt/a/b", "host/opt/b"})
    world.knob(std::string("group ") + path);
  const auto file = world.file("a.yaml", "- name: a\n- name: b\n- name: a/b\n");
  expectRun(world.poolctl({"unload", file}), 0, "", "");
  EXPECT_EQ(lookedUp(), (Calls{"host/opt/b", "host/opt/a/b", "host/opt/a"}));
}

TEST_F(Unload, OfPoolsThatWereNeverLoadedSaysNothing) {
  expectRun(world.poolctl({"unload", abc()}), 0, "", "");
  EXPECT_EQ(lookedUp().size(), 3u);
}

TEST_F(Unload, DeletesADisabledPoolToo) {
  world.knob("group host/opt/a");
  const auto file = world.file("a.yaml", "- {name: a, isEnabled: no}\n");
  expectRun(world.poolctl({"unload", file}), 0, "", "");
  EXPECT_EQ(world.groups(), kEmptyTree);
}

TEST_F(Unload, OfAPoolDeclaredTwiceDeletesItOnce) {
  world.knob("group host/opt/a");
  const auto file = world.file("a.yaml", "- name: a\n- name: a\n");
  expectRun(world.poolctl({"unload", file}), 0, "", "");
}

class GroupThatVanishes : public testing::TestWithParam<const char *> {};

TEST_P(GroupThatVanishes, IsSkippedSilentlyAndNotMadeAgain) {
  StandInWorld world;
  world.knob("group host/opt/a");
  world.knob("group host/opt/b");
  world.knob("group host/opt/c");
  world.knob(std::string("fail group=host/opt/b status=0x0bad0003 node=") + GetParam());
  world.knob("fail node=sched_groups_delete group=host/opt/a status=0x0bad0004");
  const auto file = world.file("abc.yaml", "- name: a\n- name: b\n- name: c\n");
  expectRun(world.poolctl({"unload", file}), 1, "", "KNOB_Set: status 0x0bad0004\n");
  const std::string newGroup = "input=[\"c\"]", never = "input=[\"b\"]";
  const std::string trace = testing::PrintToString(world.groupCalls());
  EXPECT_EQ(trace.find(never), std::string::npos);
  EXPECT_EQ(world.misuse(), Calls{});
  EXPECT_EQ(lines(world.groups()).size(), 5u);
}

INSTANTIATE_TEST_SUITE_P(AtEachCall, GroupThatVanishes,
                         testing::Values("sched_groupPathNameToID",
                                         "sched_groups_memAllocationInMB",
                                         "sched_groups_cpuAllocationInPct", "sched_groups_delete"));

TEST_F(Unload, ThatFailsMakesTheDeletedGroupsAgainAsTheyWereNewestFirst) {
  threeGroups();
  world.knob("fail node=sched_groups_delete group=host/opt/a status=0x0bad0004");
  expectRun(world.poolctl({"unload", abc()}), 1, "", "KNOB_Set: status 0x0bad0004\n");
  EXPECT_EQ(lookedUp(), (Calls{"host/opt/c", "host/opt/b", "host/opt/a", "host/opt", "host/opt"}));
  // The shares of the last were -1: not given, so that the new group has the kernel's own.
  EXPECT_EQ(world.groups(),
            std::string(kEmptyTree) + threeLines + "host/opt/c mem 0 -1 -1 -3 cpu 0 -1 -1 -4\n");
  const Calls calls = world.groupCalls();
  EXPECT_EQ(calls.at(13),
            "KNOB_Set sched_groups_groupCreate instance=[2] input=[\"b\"] output=8 -> 0");
  EXPECT_EQ(calls.at(17),
            "KNOB_Set sched_groups_groupCreate instance=[2] input=[\"c\"] output=8 -> 0");
}

TEST_F(Unload, OfAParentWithAnUndeclaredChildMakesTheDeletedOnesAgain) {
  world.knob("group host/opt/a min=7");
  world.knob("group host/opt/a/declared min=3 shares=8");
  world.knob("group host/opt/a/undeclared");
  const auto file = world.file("a.yaml", "- name: a\n- {name: a/declared, mem: 99}\n");
  expectRun(world.poolctl({"unload", file}), 1, "", "KNOB_Set: status 0x0bad0004\n");
  EXPECT_EQ(world.groups(), std::string(kEmptyTree) +
                                "host/opt/a mem 7 -1 -1 -3 cpu 0 -1 -1 -3\n"
                                "host/opt/a/declared mem 3 -1 -1 8 cpu 0 -1 -1 -3\n"
                                "host/opt/a/undeclared mem 0 -1 -1 -3 cpu 0 -1 -1 -3\n");
}

TEST_F(Unload, UndoReportsWhatItCannotMakeAgainAndGoesOn) {
  threeGroups();
  world.knob("fail node=sched_groups_delete group=host/opt/a status=0x0bad0004");
  world.knob("fail node=sched_groups_groupCreate group=host/opt/b status=0x0bad0001");
  world.knob(
      "fail node=sched_groups_cpuAllocationInPct function=KNOB_Set group=host/opt/c "
      "status=0x0bad00f5");
  expectRun(world.poolctl({"unload", abc()}), 1, "",
            "Failed to recreate host/opt/b: KNOB_Set: status 0x0bad0001\n"
            "Failed to recreate host/opt/c: Initialize host/opt/c: status 0x0bad00f5\n"
            "KNOB_Set: status 0x0bad0004\n");
}

TEST_F(Unload, TouchesNothingWhenADefinitionIsBad) {
  threeGroups();
  const auto bad = world.file("2.yaml", "- b\n");
  expectRun(world.poolctl({"unload", abc(), bad}), 1, "",
            bad.string() + ": line 1 column 3: expected a map\n");
  EXPECT_EQ(world.groupCalls(), Calls{});
}

TEST_F(Unload, ReadsOnlyInstalledFiles) {
  const auto path = world.folder() / "a.yaml";
  writeFile(path, "- name: a\n");
  expectRun(world.poolctl({"unload", path}), 1, "", path.string() + ": is not installed\n");
}

TEST_F(UnloadRpD, WithoutFilesTakesEveryDefinition) {
  world.knob("group host/opt/a");
  world.knob("group host/opt/b");
  world.definition("1.yaml", "- name: b\n");
  world.definition("2.yaml", "- name: a\n");
  expectRun(world.poolctl({"unload"}), 0, "", "");
  EXPECT_EQ(world.groups(), kEmptyTree);
}

TEST_F(UnloadRpD, WithFilesTakesThemAlone) {
  world.knob("group host/opt/a");
  world.knob("group host/opt/b");
  world.definition("1.yaml", "- name: b\n");
  expectRun(world.poolctl({"unload", world.file("a.yaml", "- name: a\n")}), 0, "", "");
  EXPECT_EQ(world.groups(), std::string(kEmptyTree) + "host/opt/b mem 0 -1 -1 -3 cpu 0 -1 -1 -3\n");
}

}  // namespace
}  // namespace Test
