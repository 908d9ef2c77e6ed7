// SPDX-License-Identifier: Apache-2.0
// More than there is cannot be promised: at the pool, at the groups above it, at the machine.
#include <gtest/gtest.h>

#include "expected_files.h"
#include "linux_world.h"

namespace Uml {
namespace {

class Admission : public LinuxTest {
 protected:
  // The load is refused as a whole for a reason that begins with REASON: no group of it stays, and
  // nothing is reserved.
  void expectRefused(const std::string &yaml, const std::string &culprit,
                     const std::string &reason) {
    const std::vector<std::string> before = allGroups();
    const int64_t reserved = groupExists("host") ? numberIn("host", "memory.min") : 0;
    const ::Test::ProcessResult result = load(yaml);
    EXPECT_EQ(result.status, 1);
    const std::string message = "Initialize " + culprit + ": reservation refused: " + reason;
    EXPECT_EQ(result.err.substr(0, message.size()), message) << result.err;
    EXPECT_EQ(allGroups(), before.empty() ? kFixedGroups : before);
    EXPECT_EQ(numberIn("host", "memory.min"), reserved);
  }

  std::string kernelTree() {
    std::string all;
    for (const std::string &group : allGroups()) all += group + "\n" + actualFiles(group);
    return all;
  }
};

TEST_F(Admission, MoreThanTheMachineHasIsRefused) {
  expectRefused("- name: big\n  memMin: 100000\n", "host/opt/big", "100000 MB asked for, ");
}

TEST_F(Admission, PoolsThatFitAloneButNotTogetherAreUndoneWhole) {
  expectRefused(
      "- name: a\n  memMin: 150\n- name: b\n  memMin: 150\n- name: c\n  memMin: 150\n"
      "- name: d\n  memMin: 1\n",
      "host/opt/c", "150 MB asked for, ");
}

TEST_F(Admission, MoreThanThePoolsOwnLimitIsRefused) {
  expectRefused("- name: a\n  memMin: 64\n  memMinLimit: 32\n", "host/opt/a",
                "64 MB asked for, 32 MB free in host/opt/a\n");
}

TEST_F(Admission, MoreThanAParentMayPassOnIsRefused) {
  expectRefused(
      "- name: a\n  memMinLimit: 48\n- name: a/b\n  memMin: 32\n- name: a/c\n  memMin: 32\n",
      "host/opt/a/c", "32 MB asked for, 16 MB free in host/opt/a: 32 MB for host/opt/a/b\n");
}

TEST_F(Admission, AParentFurtherUpRefusesAsWell) {
  expectRefused(
      "- name: a\n  memMinLimit: 48\n- name: a/b\n- name: a/b/c\n- name: a/b/c/d\n"
      "  memMin: 64\n",
      "host/opt/a/b/c/d", "64 MB asked for, 48 MB free in host/opt/a\n");
}

TEST_F(Admission, MoreThanAParentsMaximumIsRefused) {
  expectRefused("- name: a\n  memMax: 48\n- name: a/b\n  memMin: 64\n", "host/opt/a/b",
                "64 MB asked for, 48 MB free in host/opt/a\n");
}

TEST_F(Admission, MoreCpuThanTheMachineHasIsRefused) {
  const long cpus = sysconf(_SC_NPROCESSORS_ONLN);
  expectRefused("- name: a\n  cpuMin: " + std::to_string(60 * cpus) +
                    "\n- name: b\n  cpuMin: " + std::to_string(60 * cpus) + "\n",
                "host/opt/b", std::to_string(60 * cpus) + " ");
}

TEST_F(Admission, ARefusedBatchLeavesWhatWasThereBefore) {
  ASSERT_TRUE(silentlyDone(load("- name: there\n  memMin: 64\n  memMax: 80\n  cpuMin: 10\n")));
  const std::string before = kernelTree();
  expectRefused("- name: a\n  memMin: 64\n- name: b\n  memMin: 100000\n", "host/opt/b",
                "100000 MB asked for, ");
  EXPECT_EQ(kernelTree(), before);
}

TEST_F(Admission, WhatAPoolGivesBackAnotherCanHave) {
  world.definition("a.yaml", "- name: a\n  memMin: 300\n");
  world.definition("b.yaml", "- name: b\n  memMin: 300\n");
  ASSERT_TRUE(silentlyDone(world.poolctl({"load", "/etc/rp.d/a.yaml"})));
  EXPECT_EQ(world.poolctl({"load", "/etc/rp.d/b.yaml"}).status, 1);
  ASSERT_TRUE(silentlyDone(world.poolctl({"disable", "-n", "host/opt/a"})));
  ASSERT_TRUE(silentlyDone(world.poolctl({"load", "/etc/rp.d/b.yaml"})));
  const ::Test::ProcessResult result = world.poolctl({"enable", "host/opt/a"});
  const std::string message = "host/opt/a: KNOB_Set: reservation refused: 300 MB asked for, ";
  EXPECT_EQ(result.err.substr(0, message.size()), message) << result.err;
  EXPECT_EQ(numberIn("host/opt/a", "memory.max"), 0);
  EXPECT_EQ(numberIn("host", "memory.min"), 300 * kMiB);
}

TEST_F(Admission, SizingAGroupBeyondTheMachineIsRefused) {
  ASSERT_TRUE(silentlyDone(load("- name: a\n  memMin: 16\n  memMax: 64\n")));
  const std::string before = kernelTree();
  EXPECT_EQ(world.poolctl({"-g", "host/opt/a", "-m", "100000"}).status, 4);
  EXPECT_EQ(kernelTree(), before);
}

TEST_F(Admission, AMaximumBelowWhatThoseBelowHaveReservedIsRefused) {
  ASSERT_TRUE(silentlyDone(load("- name: a\n  memMax: 64\n- name: a/b\n  memMin: 48\n")));
  const std::string before = kernelTree();
  EXPECT_EQ(world.poolctl({"-g", "host/opt/a", "-m", "32"}).status, 4);
  EXPECT_EQ(kernelTree(), before);
}

// Pools made one beside the other at the same time cannot talk the kernel into more than it has.
TEST_F(Admission, TwoLoadsAtOnceCannotReserveTheSameMemory) {
  const auto a = world.file("a.yaml", "- name: a\n  memMin: 300\n");
  const auto b = world.file("b.yaml", "- name: b\n  memMin: 300\n");
  const ::Test::ProcessResult both =
      world.run("/bin/sh", {"-c", "poolctl load " + a.string() + " & x=$!; poolctl load " +
                                      b.string() + "; y=$?; wait $x; echo $(($? + y))"});
  EXPECT_EQ(both.out, "1\n") << both.err;
  EXPECT_EQ(numberIn("host", "memory.min"), 300 * kMiB);
}

}  // namespace
}  // namespace Uml
