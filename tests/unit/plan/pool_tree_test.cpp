// SPDX-License-Identifier: Apache-2.0
// The model of a kernel's groups: what it refuses, and with which figures.
#include "plan_check/pool_tree.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

namespace {

using Knob::AllocationChange;
using Knob::Resource;
using Plan::PoolTree;
using testing::HasSubstr;

AllocationChange minAndMax(int64_t min, int64_t max) {
  AllocationChange change;
  change.min = min;
  change.max = max;
  return change;
}

std::string refusal(PoolTree *tree, const std::string &path, int64_t min, int64_t max) {
  return tree->set(path, Resource::kMemory, minAndMax(min, max)).value_or("accepted");
}

PoolTree treeWith(std::initializer_list<const char *> paths) {
  PoolTree tree(1000, 400);
  for (const char *const path : paths) tree.create(path);
  return tree;
}

TEST(PoolTree, BeginsWithTheTwoFixedGroups) {
  const PoolTree tree(1000, 400);
  EXPECT_TRUE(tree.has("host"));
  EXPECT_TRUE(tree.has("host/opt"));
  EXPECT_FALSE(tree.has("host/opt/a"));
}

TEST(PoolTree, RefusesMoreThanTheMachineHas) {
  PoolTree tree = treeWith({"host/opt/a", "host/opt/b"});
  EXPECT_EQ(refusal(&tree, "host/opt/a", 700, -1), "accepted");
  EXPECT_EQ(refusal(&tree, "host/opt/b", 400, -1),
            "asked: 400 MB; the machine has 1000 MB, of which 300 MB are free; held by host/opt/a "
            "(700 MB)");
  EXPECT_EQ(refusal(&tree, "host/opt/b", 300, -1), "accepted");
}

TEST(PoolTree, RefusesMoreThanTheParentMayHave) {
  PoolTree tree = treeWith({"host/opt/a", "host/opt/a/b", "host/opt/a/c"});
  EXPECT_EQ(refusal(&tree, "host/opt/a", 0, 100), "accepted");
  EXPECT_EQ(refusal(&tree, "host/opt/a/b", 70, -1), "accepted");
  EXPECT_EQ(refusal(&tree, "host/opt/a/c", 40, -1),
            "asked: 40 MB; free in host/opt/a: 30 MB of 100 MB; held by host/opt/a/b (70 MB)");
}

TEST(PoolTree, RefusesWhatNoKernelAccepts) {
  PoolTree tree = treeWith({"host/opt/a"});
  EXPECT_THAT(refusal(&tree, "host/opt/a", 300, 200), HasSubstr("above max"));
  EXPECT_THAT(refusal(&tree, "host/opt/a", -5, 200), HasSubstr("negative"));
}

TEST(PoolTree, ARefusedChangeChangesNothing) {
  PoolTree tree = treeWith({"host/opt/a", "host/opt/b"});
  EXPECT_NE(refusal(&tree, "host/opt/a", 1001, -1), "accepted");
  EXPECT_EQ(tree.allocation("host/opt/a", Resource::kMemory).min, 0);
  EXPECT_EQ(refusal(&tree, "host/opt/b", 1000, -1), "accepted");
}

TEST(PoolTree, WhatIsRemovedIsFreeAgain) {
  PoolTree tree = treeWith({"host/opt/a", "host/opt/a/b"});
  EXPECT_EQ(refusal(&tree, "host/opt/a/b", 1000, -1), "accepted");
  EXPECT_TRUE(tree.hasChildren("host/opt/a"));
  tree.remove("host/opt/a/b");
  EXPECT_FALSE(tree.hasChildren("host/opt/a"));
  EXPECT_EQ(refusal(&tree, "host/opt/a", 1000, -1), "accepted");
}

}  // namespace
