// SPDX-License-Identifier: Apache-2.0
// The load command: what it creates, what it leaves, and how it undoes.
#include "cli_fixture.h"

namespace Test {
namespace {

constexpr const char *kEmptyTree =
    "host mem 0 -1 -1 -3 cpu 0 -1 -1 -3\n"
    "host/opt mem 0 -1 -1 -3 cpu 0 -1 -1 -3\n";

class Load : public Cli {
 protected:
  std::string fivePools() {
    return world.file("five.yaml", "- name: a\n- name: b\n- name: c\n- name: d\n- name: e\n");
  }

  // The groups that the run asked the kernel to create, in order.
  Calls created() { return inputsOf("sched_groups_groupCreate"); }

  // What the run asked of a node, in order: its inputs, or its instances where it takes none.
  Calls inputsOf(const std::string &node) {
    Calls result;
    for (const std::string &call : world.groupCalls()) {
      if (call.find(" " + node + " ") == std::string::npos) continue;
      const std::string mark =
          call.find("input=null") == std::string::npos ? "input=" : "instance=";
      const size_t begin = call.find(mark) + mark.size();
      result.push_back(call.substr(begin, call.find(']', begin) + 1 - begin));
    }
    return result;
  }
};

class LoadRpD : public CliWithRpD {};

TEST_F(Load, CreatesAPoolWithBothAllocationsAndSaysNothing) {
  const auto file = world.file("a.yaml", "- {name: a, memMin: 512, memMax: 1024}\n");
  expectRun(world.poolctl({"load", file}), 0, "", "");
  EXPECT_EQ(world.groupCalls(),
            (Calls{"KNOB_Set sched_groupPathNameToID instance=null input=[\"host/opt\"] output=8 "
                   "-> 0",
                   "KNOB_Set sched_groups_groupCreate instance=[2] input=[\"a\"] output=8 -> 0",
                   "KNOB_Set sched_groups_memAllocationInMB instance=[101] "
                   "input=[\"min=512\",\"max=1024\",\"minLimit=-1\"] output=0 -> 0",
                   "KNOB_Set sched_groups_cpuAllocationInPct instance=[101] "
                   "input=[\"min=0\",\"max=-1\",\"minLimit=-1\",\"shares=1000\"] output=0 -> 0"}));
  EXPECT_EQ(world.groups(),
            std::string(kEmptyTree) + "host/opt/a mem 512 1024 -1 -3 cpu 0 -1 -1 1000\n");
}

TEST_F(Load, CreatesParentsBeforeChildrenWhateverTheirOrderInTheFile) {
  const auto file = world.file("a.yaml", "- name: a/b/c\n- name: a/b\n- name: a\n");
  expectRun(world.poolctl({"load", file}), 0, "", "");
  EXPECT_EQ(created(), (Calls{"[\"a\"]", "[\"b\"]", "[\"c\"]"}));
}

TEST_F(Load, SkipsADisabledPoolSilently) {
  const auto file = world.file("a.yaml", "- {name: a, isEnabled: no}\n- name: b\n");
  expectRun(world.poolctl({"load", file}), 0, "", "");
  EXPECT_EQ(created(), Calls{"[\"b\"]"});
}

TEST_F(Load, SkipsAnExistingGroupAloudAndLeavesItAsItIs) {
  world.knob("group host/opt/a min=5 max=6 cpuShares=7");
  const auto file = world.file("a.yaml", "- {name: a, mem: 9}\n- name: b\n");
  expectRun(world.poolctl({"load", file}), 0, "", "host/opt/a exists; skipping.\n");
  EXPECT_EQ(world.groups(), std::string(kEmptyTree) +
                                "host/opt/a mem 5 6 -1 -3 cpu 0 -1 -1 7\n"
                                "host/opt/b mem 0 -1 -1 -3 cpu 0 -1 -1 1000\n");
}

TEST_F(Load, SkipsAnExistingGroupSilentlyWhenQuiet) {
  world.knob("group host/opt/a");
  expectRun(world.poolctl({"load", "-q", world.file("a.yaml", "- name: a\n")}), 0, "", "");
}

TEST_F(Load, APoolDeclaredTwiceExistsTheSecondTime) {
  const auto file = world.file("a.yaml", "- name: a\n- name: a\n");
  expectRun(world.poolctl({"load", file}), 0, "", "host/opt/a exists; skipping.\n");
}

TEST_F(Load, ThatFailsAtTheThirdOfFiveDeletesTheSecondAndThenTheFirst) {
  world.knob("fail node=sched_groups_groupCreate group=host/opt/c status=0x0bad00f5");
  expectRun(world.poolctl({"load", fivePools()}), 1, "", "KNOB_Set: status 0x0bad00f5\n");
  EXPECT_EQ(created(), (Calls{"[\"a\"]", "[\"b\"]", "[\"c\"]"}));
  EXPECT_EQ(inputsOf("sched_groupPathNameToID"),
            (Calls{"[\"host/opt\"]", "[\"host/opt\"]", "[\"host/opt\"]", "[\"host/opt/b\"]",
                   "[\"host/opt/a\"]"}));
  EXPECT_EQ(inputsOf("sched_groups_delete"), (Calls{"[102]", "[101]"}));
  EXPECT_EQ(world.groups(), kEmptyTree);
}

TEST_F(Load, ThatCannotSetAnAllocationNamesThePoolAndUndoes) {
  world.knob("fail node=sched_groups_memAllocationInMB group=host/opt/b status=0x0bad00f5");
  expectRun(world.poolctl({"load", fivePools()}), 1, "",
            "Initialize host/opt/b: status 0x0bad00f5\n");
  EXPECT_EQ(inputsOf("sched_groups_delete"), (Calls{"[102]", "[101]"}));
  EXPECT_EQ(world.groups(), kEmptyTree);
}

TEST_F(Load, UndoLeavesGroupsOfOthersAlone) {
  world.knob("group host/opt/a min=5");
  world.knob("fail node=sched_groups_groupCreate group=host/opt/c status=0x0bad00f5");
  world.poolctl({"load", "-q", fivePools()});
  EXPECT_EQ(world.groups(), std::string(kEmptyTree) + "host/opt/a mem 5 -1 -1 -3 cpu 0 -1 -1 -3\n");
}

TEST_F(Load, UndoReportsWhatItCannotDeleteAndGoesOn) {
  world.knob("fail node=sched_groups_groupCreate group=host/opt/d status=0x0bad00f5");
  world.knob("fail node=sched_groups_delete group=host/opt/c status=0x0bad0004");
  world.knob("fail node=sched_groupPathNameToID group=host/opt/b status=0x0bad0001");
  expectRun(world.poolctl({"load", fivePools()}), 1, "",
            "Failed to delete host/opt/c: KNOB_Set: status 0x0bad0004\n"
            "Failed to delete host/opt/b: KNOB_Set: status 0x0bad0001\n"
            "KNOB_Set: status 0x0bad00f5\n");
  EXPECT_EQ(inputsOf("sched_groups_delete"), (Calls{"[103]", "[101]"}));
}

TEST_F(Load, AMissingParentIsAFailureThatUndoes) {
  const auto file = world.file("a.yaml", "- name: a\n- name: b/c\n");
  expectRun(world.poolctl({"load", file}), 1, "", "KNOB_Set: status 0x0bad0003\n");
  EXPECT_EQ(world.groups(), kEmptyTree);
}

TEST_F(Load, TouchesNothingWhenADefinitionIsBad) {
  const auto good = world.file("1.yaml", "- name: a\n"), bad = world.file("2.yaml", "- b\n");
  expectRun(world.poolctl({"load", good, bad}), 1, "",
            bad.string() + ": line 1 column 3: expected a map\n");
  EXPECT_EQ(world.groupCalls(), Calls{});
}

TEST_F(Load, ReadsOnlyInstalledFiles) {
  const auto path = world.folder() / "a.yaml";
  writeFile(path, "- name: a\n");
  expectRun(world.poolctl({"load", path}), 1, "", path.string() + ": is not installed\n");
}

TEST_F(LoadRpD, WithoutFilesTakesEveryDefinition) {
  world.definition("1.yaml", "- name: b\n");
  world.definition("2.yaml", "- name: a\n");
  expectRun(world.poolctl({"load"}), 0, "", "");
  EXPECT_EQ(lines(world.groups()).size(), 4u);
}

TEST_F(LoadRpD, WithFilesTakesThemAlone) {
  world.definition("1.yaml", "- name: b\n");
  expectRun(world.poolctl({"load", world.file("a.yaml", "- name: a\n")}), 0, "", "");
  EXPECT_EQ(world.groups(),
            std::string(kEmptyTree) + "host/opt/a mem 0 -1 -1 -3 cpu 0 -1 -1 1000\n");
}

TEST_F(LoadRpD, OfAnEmptyFolderIsASuccess) {
  expectRun(world.poolctl({"load"}), 0, "", "");
}

}  // namespace
}  // namespace Test
