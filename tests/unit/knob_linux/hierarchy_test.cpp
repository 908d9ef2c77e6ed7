// SPDX-License-Identifier: Apache-2.0
// Where the tree is: mounts as Linux lists them, and why a controller is missing.
#include "knob/linux/hierarchy.h"

#include <gtest/gtest.h>

namespace Knob::Linux {
namespace {

constexpr const char *kUnified =
    "41 31 0:38 / /sys/fs/cgroup rw,nosuid shared:9 - cgroup2 cgroup2 rw,nsdelegate\n";

TEST(MountInfo, AnEmptyTextHasNoMounts) {
  const CgroupMounts mounts = parseMountInfo("");
  EXPECT_TRUE(mounts.unified.empty());
  EXPECT_TRUE(mounts.legacyControllers.empty());
}

TEST(MountInfo, AUnifiedMountIsFoundWithIdRootAndPoint) {
  const CgroupMounts mounts = parseMountInfo(kUnified);
  ASSERT_EQ(mounts.unified.size(), 1U);
  EXPECT_EQ(mounts.unified[0].id, 41);
  EXPECT_EQ(mounts.unified[0].root, "/");
  EXPECT_EQ(mounts.unified[0].point, "/sys/fs/cgroup");
  EXPECT_FALSE(mounts.unified[0].readOnly);
}

TEST(MountInfo, AnyNumberOfOptionalFieldsMayStandBeforeTheDash) {
  for (const char *optional : {"", "shared:1 ", "shared:1 master:2 propagate_from:3 "}) {
    const CgroupMounts mounts =
        parseMountInfo(std::string("1 2 0:3 / /c rw ") + optional + "- cgroup2 none rw\n");
    ASSERT_EQ(mounts.unified.size(), 1U) << optional;
    EXPECT_EQ(mounts.unified[0].point, "/c");
  }
}

TEST(MountInfo, SeveralMountsKeepTheirOrder) {
  const CgroupMounts mounts = parseMountInfo(
      "1 0 0:3 / /first rw - cgroup2 a rw\n"
      "2 0 0:4 / / rw - ext4 /dev/sda rw\n"
      "3 0 0:3 /system.slice /second rw - cgroup2 b rw\n");
  ASSERT_EQ(mounts.unified.size(), 2U);
  EXPECT_EQ(mounts.unified[0].point, "/first");
  EXPECT_EQ(mounts.unified[1].point, "/second");
  EXPECT_EQ(mounts.unified[1].root, "/system.slice");
}

TEST(MountInfo, EscapedBytesAreReadAsTheyAre) {
  const CgroupMounts mounts =
      parseMountInfo("1 0 0:3 /a\\134b /my\\040groups\\011\\012 rw - cgroup2 c rw\n");
  ASSERT_EQ(mounts.unified.size(), 1U);
  EXPECT_EQ(mounts.unified[0].root, "/a\\b");
  EXPECT_EQ(mounts.unified[0].point, "/my groups\t\n");
}

TEST(MountInfo, ABackslashThatBeginsNoEscapeStays) {
  const CgroupMounts mounts = parseMountInfo("1 0 0:3 /\\9 /x\\04 rw - cgroup2 c rw\n");
  ASSERT_EQ(mounts.unified.size(), 1U);
  EXPECT_EQ(mounts.unified[0].root, "/\\9");
  EXPECT_EQ(mounts.unified[0].point, "/x\\04");
}

TEST(MountInfo, ReadOnlyIsToldByEitherListOfOptions) {
  EXPECT_TRUE(parseMountInfo("1 0 0:3 / /c ro,nosuid - cgroup2 c rw\n").unified[0].readOnly);
  EXPECT_TRUE(parseMountInfo("1 0 0:3 / /c rw - cgroup2 c ro,nsdelegate\n").unified[0].readOnly);
  EXPECT_FALSE(parseMountInfo("1 0 0:3 / /c rw,root - cgroup2 c rw\n").unified[0].readOnly);
}

TEST(MountInfo, TheOldHierarchiesNameTheControllersThatTheyHold) {
  const CgroupMounts mounts = parseMountInfo(
      "32 31 0:29 / /sys/fs/cgroup/cpu rw - cgroup cgroup rw,cpu,cpuacct\n"
      "35 31 0:32 / /sys/fs/cgroup/memory rw - cgroup cgroup rw,memory\n");
  EXPECT_TRUE(mounts.unified.empty());
  EXPECT_EQ(mounts.legacyControllers,
            (std::vector<std::string>{"rw", "cpu", "cpuacct", "rw", "memory"}));
}

TEST(MountInfo, LinesThatAreNoMountsArePassedOver) {
  for (const char *line : {"\n\n", "nonsense\n", "1 2 3\n", "1 0 0:3 / /c rw - cgroup2\n",
                           "x 0 0:3 / /c rw - cgroup2 c rw\n", "1 0 0:3 / /c rw cgroup2 c rw\n",
                           "- - - - - -\n", "1 0 0:3 / /c - cgroup2 c rw\n"}) {
    EXPECT_TRUE(parseMountInfo(line).unified.empty()) << line;
    EXPECT_EQ(parseMountInfo(std::string(line) + kUnified).unified.size(), 1U) << line;
  }
}

bool contains(const std::string &text, const std::string &part) {
  return text.find(part) != std::string::npos;
}

TEST(MountInfo, RecursiveProtectionIsAnOptionOfTheFileSystem) {
  const std::string line = "41 31 0:38 / /sys/fs/cgroup rw - cgroup2 none rw";
  EXPECT_FALSE(parseMountInfo(line + "\n").unified[0].protectsRecursively);
  EXPECT_TRUE(parseMountInfo(line + ",memory_recursiveprot\n").unified[0].protectsRecursively);
}

TEST(MissingControllers, IsEmptyWhereBothAreEnabled) {
  EXPECT_EQ(missingControllers("cpuset cpu io memory pids", {}, "/sys/fs/cgroup", true), "");
}

TEST(MissingControllers, NamesTheOldHierarchyThatHasThem) {
  CgroupMounts mounts;
  mounts.legacyControllers = {"rw", "memory"};
  const std::string text = missingControllers("cpu", mounts, "/sys/fs/cgroup", true);
  EXPECT_TRUE(contains(text, "the memory controller belongs to the old cgroup hierarchy")) << text;
  EXPECT_TRUE(contains(text, "cgroup_no_v1=all")) << text;
  EXPECT_FALSE(contains(text, "cpu controller")) << text;
}

TEST(MissingControllers, GivesAReasonForEach) {
  CgroupMounts mounts;
  mounts.legacyControllers = {"cpu"};
  const std::string text = missingControllers("io pids", mounts, "/sys/fs/cgroup", true);
  EXPECT_TRUE(contains(text, "this kernel offers no memory controller")) << text;
  EXPECT_TRUE(contains(text, "cgroup_disable=memory")) << text;
  EXPECT_TRUE(contains(text, "the cpu controller belongs to the old")) << text;
}

TEST(MissingControllers, BelowTheTopNamesTheGroupThatMustEnableThem) {
  const std::string text = missingControllers("memory", {}, "/sys/fs/cgroup/pods", false);
  EXPECT_TRUE(contains(text, "the cpu controller is not enabled in /sys/fs/cgroup/pods")) << text;
  EXPECT_TRUE(contains(text, "write +cpu to the cgroup.subtree_control")) << text;
}

}  // namespace
}  // namespace Knob::Linux
