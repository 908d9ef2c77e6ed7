// SPDX-License-Identifier: Apache-2.0
// poolctl on the Linux kernel: what it was told is what the kernel's own files say.
#include <gtest/gtest.h>
#include <unistd.h>

#include <chrono>
#include <future>

#include "expected_files.h"
#include "linux_world.h"

namespace Uml {
namespace {

int64_t cpus() {
  return sysconf(_SC_NPROCESSORS_ONLN);
}

class Poolctl : public LinuxTest {
 protected:
  // What is listed is what stands in the kernel: these groups, and no others.
  void expectKernelHasWhatIsListed(const ::Test::Arguments &files = {}) {
    ::Test::Arguments arguments{"list", "-v"};
    arguments.insert(arguments.end(), files.begin(), files.end());
    const ::Test::ProcessResult list = world.poolctl(arguments);
    ASSERT_EQ(list.status, 0) << list.err;
    std::map<std::string, std::string> expected = expectedFiles(parseList(list.out), cpus());
    ASSERT_FALSE(expected.empty());
    expected.erase("host/opt");  // there for good, whatever is loaded
    expected.erase("host");
    std::map<std::string, std::string> actual;
    for (const std::string &group : allGroups())
      if (group != "host" && group != "host/opt") actual[group] = actualFiles(group);
    EXPECT_EQ(actual, expected);
    for (const auto &[group, files2] : expectedFiles(parseList(list.out), cpus()))
      EXPECT_EQ(actualFiles(group), files2) << group;
  }
};

TEST_F(Poolctl, LoadPutsEveryNumberIntoTheKernelsFiles) {
  ASSERT_TRUE(
      silentlyDone(load("- name: web\n  memMin: 32\n  memMax: 128\n  cpuMin: 20\n"
                        "  cpuMax: 50\n  cpuShares: 3000\n")));
  EXPECT_EQ(readControl("host/opt/web", "memory.min"), std::to_string(32 * kMiB));
  EXPECT_EQ(readControl("host/opt/web", "memory.max"), std::to_string(128 * kMiB));
  EXPECT_EQ(readControl("host/opt/web", "memory.high"), "max");
  EXPECT_EQ(readControl("host/opt/web", "memory.low"), "0");
  EXPECT_EQ(readControl("host/opt/web", "cpu.max"), "50000 100000");
  EXPECT_EQ(readControl("host/opt/web", "cpu.weight"), "10000") << "an only pool has all of it";
  expectKernelHasWhatIsListed({(world.folder() / "pools.yaml").string()});
}

TEST_F(Poolctl, APoolWithoutNumbersHasNeitherMinimumNorMaximum) {
  ASSERT_TRUE(silentlyDone(load("- name: plain\n")));
  EXPECT_EQ(actualFiles("host/opt/plain"),
            "memory.min: 0\nmemory.max: max\ncpu.max: max 100000\ncpu.weight: 100\n");
}

TEST_F(Poolctl, ReservationsReachEveryGroupAbove) {
  ASSERT_TRUE(
      silentlyDone(load("- name: a\n  memMin: 10\n- name: a/b\n- name: a/b/c\n  memMin: 24\n"
                        "- name: a/b/d\n  memMin: 8\n- name: e\n  memMin: 4\n")));
  EXPECT_EQ(numberIn("host/opt/a/b", "memory.min"), 32 * kMiB);
  EXPECT_EQ(numberIn("host/opt/a", "memory.min"), 32 * kMiB);
  EXPECT_EQ(numberIn("host/opt", "memory.min"), 36 * kMiB);
  EXPECT_EQ(numberIn("host", "memory.min"), 36 * kMiB);
  EXPECT_EQ(readControl("host/opt/a", "cgroup.type"), "domain");
}

TEST_F(Poolctl, ManyShapesOfATreeComeOutAsListed) {
  for (const char *yaml :
       {"- name: a\n  mem: 64\n- name: a/b\n  memMin: 16\n  memMax: 48\n- name: a/c\n  mem: 40\n",
        "- name: host/infra\n  memMin: 20\n  cpuMin: 30\n- name: host/infra/x\n  cpuMin: 10\n"
        "- name: host/infra/y\n  cpuMin: 25\n  cpuMax: 75\n",
        "- name: s\n  cpuShares: 0\n- name: t\n  cpuShares: 1000000\n- name: u\n  cpuShares: -2\n"
        "- name: v\n  cpuShares: -4\n- name: w\n  cpuShares: 15\n",
        "- name: q\n  cpuMax: 0\n- name: r\n  cpuMax: 1\n- name: x\n  cpuMax: 1000\n",
        "- name: off\n  isEnabled: false\n- name: on\n  memMax: 0\n"}) {
    SCOPED_TRACE(yaml);
    ASSERT_TRUE(silentlyDone(load(yaml)));
    expectKernelHasWhatIsListed({(world.folder() / "pools.yaml").string()});
    ASSERT_TRUE(silentlyDone(world.poolctl({"unload", (world.folder() / "pools.yaml").string()})));
  }
}

TEST_F(Poolctl, TheExamplesLoadAndUnload) {
  for (const auto &entry : std::filesystem::directory_iterator(EXAMPLES_FOLDER))
    world.definition(entry.path().filename().string(), ::Test::readFile(entry.path()));
  ASSERT_TRUE(silentlyDone(world.poolctl({"load"})));
  expectKernelHasWhatIsListed();
  ASSERT_TRUE(silentlyDone(world.poolctl({"unload"})));
  EXPECT_EQ(allGroups(), kFixedGroups);
}

TEST_F(Poolctl, UnloadLeavesNothing) {
  ASSERT_TRUE(
      silentlyDone(load("- name: a\n  memMin: 64\n  cpuMin: 10\n- name: a/b\n  memMin: 8\n")));
  ASSERT_TRUE(silentlyDone(world.poolctl({"unload", (world.folder() / "pools.yaml").string()})));
  EXPECT_EQ(allGroups(), kFixedGroups);
  for (const std::string &group : kFixedGroups) {
    EXPECT_EQ(actualFiles(group),
              "memory.min: 0\nmemory.max: max\ncpu.max: max 100000\ncpu.weight: 100\n");
  }
}

TEST_F(Poolctl, ASecondLoadLeavesTheGroupsAsTheyAre) {
  ASSERT_TRUE(silentlyDone(load("- name: web\n  memMin: 32\n")));
  const ::Test::ProcessResult again = load("- name: web\n  memMin: 64\n");
  EXPECT_EQ(again.status, 0);
  EXPECT_EQ(again.err, "host/opt/web exists; skipping.\n");
  EXPECT_EQ(numberIn("host/opt/web", "memory.min"), 32 * kMiB);
}

TEST_F(Poolctl, DisableGivesTheReservationBackAndEnableTakesItAgain) {
  world.definition("web.yaml", "- name: web\n  memMin: 32\n  memMax: 128\n  cpuMin: 20\n");
  ASSERT_TRUE(silentlyDone(world.poolctl({"load"})));
  ASSERT_TRUE(silentlyDone(world.poolctl({"disable", "-n", "host/opt/web"})));
  EXPECT_EQ(numberIn("host/opt/web", "memory.max"), 0);
  EXPECT_EQ(numberIn("host", "memory.min"), 0);
  ASSERT_TRUE(silentlyDone(world.poolctl({"enable", "host/opt/web"})));
  expectKernelHasWhatIsListed();
  ASSERT_TRUE(silentlyDone(world.poolctl({"disable", "host/opt/web"})));
  EXPECT_FALSE(groupExists("host/opt/web"));
  ASSERT_TRUE(silentlyDone(world.poolctl({"enable", "host/opt/web"})));
  expectKernelHasWhatIsListed();
}

TEST_F(Poolctl, DisableOfAPoolThatIsNotThereSaysSo) {
  const ::Test::ProcessResult result = world.poolctl({"disable", "host/opt/none"});
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(result.out, "host/opt/none: KNOB_Set: not found: host/opt/none\n");
}

TEST_F(Poolctl, OptionModeReadsAndSizesAGroup) {
  ASSERT_TRUE(
      silentlyDone(load("- name: a\n  memMin: 16\n  memMax: 64\n- name: a/b\n  memMin: 8\n")));
  EXPECT_EQ(world.poolctl({"-g", "host/opt/a", "-e"}).out, "not empty\n");
  EXPECT_EQ(world.poolctl({"-g", "host/opt/a/b", "-e"}).out, "empty\n");
  EXPECT_EQ(world.poolctl({"-g", "host/opt/a", "-i"}).out,
            "{\n\"minMB\": 16,\n\"maxMB\": 64,\n\"rminpeakMB\": 16,\n\"rminchildpeakMB\": 8\n}\n");
  ASSERT_TRUE(silentlyDone(world.poolctl({"-g", "host/opt/a", "-m", "24"})));
  EXPECT_EQ(numberIn("host/opt/a", "memory.min"), 24 * kMiB);
  EXPECT_EQ(numberIn("host/opt/a", "memory.max"), 24 * kMiB);
  EXPECT_EQ(numberIn("host", "memory.min"), 24 * kMiB);
  ASSERT_TRUE(silentlyDone(world.poolctl({"-g", "host/opt/a", "-m", "8"})));
  EXPECT_EQ(world.poolctl({"-g", "host/opt/a", "-i"}).out,
            "{\n\"minMB\": 8,\n\"maxMB\": 8,\n\"rminpeakMB\": 24,\n\"rminchildpeakMB\": 8\n}\n");
  EXPECT_EQ(numberIn("host", "memory.min"), 8 * kMiB);
}

TEST_F(Poolctl, OptionModeWaitsUntilAGroupHasNoGroupsBelow) {
  ASSERT_TRUE(silentlyDone(load("- name: a\n- name: a/b\n")));
  EXPECT_EQ(world.poolctl({"-g", "host/opt/a", "-w", "1"}).status, 3);
  ASSERT_TRUE(silentlyDone(world.poolctl({"disable", "host/opt/a/b"})));
  const ::Test::ProcessResult result = world.poolctl({"-g", "host/opt/a", "-w", "1", "-m", "32"});
  EXPECT_EQ(result.out, "empty\n");
  EXPECT_EQ(numberIn("host/opt/a", "memory.min"), 32 * kMiB);
}

TEST_F(Poolctl, AGroupThatSomebodyElseMadeIsReadFromItsFilesAndLeftAlone) {
  ASSERT_TRUE(silentlyDone(load("- name: web\n")));
  std::filesystem::create_directory(kMount / "host/opt/other");
  writeControl("host/opt/other", "memory.max", std::to_string(48 * kMiB));
  writeControl("host/opt/other", "cpu.weight", "70");
  const std::string before = actualFiles("host/opt/other");
  EXPECT_EQ(world.poolctl({"-g", "host/opt/other", "-i"}).out,
            "{\n\"minMB\": 0,\n\"maxMB\": 48,\n\"rminpeakMB\": 0,\n\"rminchildpeakMB\": 0\n}\n");
  ASSERT_TRUE(silentlyDone(world.poolctl({"unload", (world.folder() / "pools.yaml").string()})));
  EXPECT_EQ(actualFiles("host/opt/other"), before);
}

TEST_F(Poolctl, WhatStandsBesideHostIsNeverTouched) {
  std::filesystem::create_directory(kMount / "system.slice");
  std::filesystem::create_directory(kMount / "system.slice/sshd.service");
  ASSERT_TRUE(silentlyDone(load("- name: web\n  memMin: 64\n")));
  writeControl("system.slice", "memory.min", std::to_string(8 * kMiB));
  const std::string before = actualFiles("system.slice");
  ASSERT_TRUE(silentlyDone(world.poolctl({"unload", (world.folder() / "pools.yaml").string()})));
  EXPECT_EQ(actualFiles("system.slice"), before);
  EXPECT_EQ(readControl("system.slice", "cgroup.subtree_control"), "");
}

TEST_F(Poolctl, AFailedUnloadRebuildsPoolsBelowADisabledOne) {
  ASSERT_TRUE(silentlyDone(load("- name: a\n- name: a/b\n- name: a/c\n  memMax: 64\n")));
  ASSERT_TRUE(silentlyDone(world.poolctl({"disable", "-n", "host/opt/a"})));
  std::filesystem::create_directory(kMount / "host/opt/a/b/foreign");
  const std::string file = (world.folder() / "pools.yaml").string();
  EXPECT_EQ(world.poolctl({"unload", file}).status, 1);
  EXPECT_EQ(numberIn("host/opt/a", "memory.max"), 0);
  EXPECT_EQ(numberIn("host/opt/a/c", "memory.max"), 64 * kMiB);
  EXPECT_EQ(world.run("knobctl", {"check"}).status, 0);
}

TEST_F(Poolctl, DisableWaitsWhileAPoolBelowHasAReservation) {
  ASSERT_TRUE(silentlyDone(load("- name: a\n- name: a/b\n  memMin: 16\n")));
  auto command = std::async(std::launch::async, [&] {
    return world.poolctl({"disable", "-w", "60", "host/opt/a"});
  });
  EXPECT_EQ(command.wait_for(std::chrono::seconds(2)), std::future_status::timeout);
  EXPECT_TRUE(silentlyDone(world.poolctl({"disable", "host/opt/a/b"})));
  EXPECT_TRUE(silentlyDone(command.get()));
  EXPECT_EQ(allGroups(), kFixedGroups);
}

TEST_F(Poolctl, TheFixedGroupsCannotBeDisabled) {
  for (const char *group : {"host", "host/opt"}) {
    EXPECT_EQ(world.poolctl({"disable", group}).status, 1);
    EXPECT_EQ(numberIn("host", "memory.max"), kMax);
  }
  EXPECT_TRUE(silentlyDone(load("- name: web\n")));
}

}  // namespace
}  // namespace Uml
