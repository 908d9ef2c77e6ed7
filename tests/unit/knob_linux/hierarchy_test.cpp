// SPDX-License-Identifier: Apache-2.0
// What is told of a host whose groups lack a controller.
#include "knob/linux/hierarchy.h"

#include <gtest/gtest.h>

namespace Knob::Linux {
namespace {

bool contains(const std::string &text, const std::string &part) {
  return text.find(part) != std::string::npos;
}

TEST(MissingControllers, NothingIsSaidWhereBothAreThere) {
  EXPECT_EQ(missingControllers("cpuset cpu io memory pids", {}, "/sys/fs/cgroup", true), "");
}

TEST(MissingControllers, TheOldHierarchyIsNamedWhereItHoldsThem) {
  CgroupMounts mounts;
  mounts.legacyControllers = {"rw", "memory"};
  const std::string text = missingControllers("cpu", mounts, "/sys/fs/cgroup", true);
  EXPECT_TRUE(contains(text, "the memory controller is held by the old cgroup hierarchy")) << text;
  EXPECT_TRUE(contains(text, "cgroup_no_v1=all")) << text;
  EXPECT_FALSE(contains(text, "cpu controller")) << text;
}

TEST(MissingControllers, EachOfTwoHasItsReason) {
  CgroupMounts mounts;
  mounts.legacyControllers = {"cpu"};
  const std::string text = missingControllers("io pids", mounts, "/sys/fs/cgroup", true);
  EXPECT_TRUE(contains(text, "this kernel offers no memory controller")) << text;
  EXPECT_TRUE(contains(text, "cgroup_disable=memory")) << text;
  EXPECT_TRUE(contains(text, "the cpu controller is held by the old")) << text;
}

TEST(MissingControllers, BelowTheTopTheGroupAboveHasToPassThemOn) {
  const std::string text = missingControllers("memory", {}, "/sys/fs/cgroup/pods", false);
  EXPECT_TRUE(contains(text, "the cpu controller is not passed on to /sys/fs/cgroup/pods")) << text;
  EXPECT_TRUE(contains(text, "write +cpu to the cgroup.subtree_control")) << text;
}

}  // namespace
}  // namespace Knob::Linux
