// SPDX-License-Identifier: Apache-2.0
// Processes in groups, and the memory that living ones hold.
#include <unistd.h>

#include "contract_test.h"
#include "held_process.h"

namespace Contract {
namespace {

using Members = ContractTest;
using MemoryInUse = ContractTest;

TEST_F(Members, ANewGroupHasNone) {
  EXPECT_EQ(countMembers(newGroup("host/opt", "pool")).value, 0);
}

TEST_F(Members, ALivingProcessJoinsAndIsCounted) {
  const int64_t id = newGroup("host/opt", "pool");
  HeldProcess one, two;
  EXPECT_EQ(join(id, one.pid()), kSuccess);
  EXPECT_EQ(join(id, two.pid()), kSuccess);
  EXPECT_EQ(join(id, two.pid()), kSuccess) << "it is in it already";
  EXPECT_EQ(countMembers(id).value, 2);
}

TEST_F(Members, AProcessIsInOneGroupOnly) {
  const int64_t first = newGroup("host/opt", "first");
  const int64_t second = newGroup("host/opt", "second");
  HeldProcess process;
  ASSERT_EQ(join(first, process.pid()), kSuccess);
  ASSERT_EQ(join(second, process.pid()), kSuccess);
  EXPECT_EQ(countMembers(first).value, 0);
  EXPECT_EQ(countMembers(second).value, 1);
  EXPECT_EQ(remove(first), kSuccess);
}

TEST_F(Members, ADeadProcessIsNoMember) {
  const int64_t id = newGroup("host/opt", "pool");
  HeldProcess process;
  ASSERT_EQ(join(id, process.pid()), kSuccess);
  process.end();
  EXPECT_EQ(countMembers(id).value, 0);
}

TEST_F(Members, AZombieIsNoMember) {
  const int64_t id = newGroup("host/opt", "pool");
  HeldProcess process;
  ASSERT_EQ(join(id, process.pid()), kSuccess);
  process.endButDoNotReap();
  EXPECT_EQ(countMembers(id).value, 0);
  EXPECT_EQ(remove(id), kSuccess);
}

TEST_F(Members, TheDeadMakeRoomForOthers) {
  const int64_t id = newGroup("host/opt", "pool");
  HeldProcess dead, living;
  ASSERT_EQ(join(id, dead.pid()), kSuccess);
  dead.end();
  EXPECT_EQ(join(id, living.pid()), kSuccess);
  EXPECT_EQ(countMembers(id).value, 1);
}

TEST_F(Members, NoSuchProcessIsNotFound) {
  const int64_t id = newGroup("host/opt", "pool");
  HeldProcess gone;
  const int64_t pid = gone.pid();
  gone.end();
  for (const int64_t wrong : {pid, int64_t{0}, int64_t{-1}, INT64_MAX, INT64_MIN}) {
    EXPECT_EQ(join(id, wrong), kNotFound) << wrong;
  }
  EXPECT_EQ(countMembers(id).value, 0);
}

TEST_F(Members, AGroupWithChildGroupsTakesNone) {
  newGroup("host/opt", "parent");
  newGroup("host/opt/parent", "child");
  HeldProcess process;
  EXPECT_EQ(join(idOf("host/opt/parent"), process.pid()), kBusy);
  EXPECT_EQ(join(idOf("host"), process.pid()), kBusy);
  EXPECT_EQ(countMembers(idOf("host/opt/parent")).value, 0);
}

TEST_F(Members, AGroupWithAMemberTakesNoChildGroups) {
  const int64_t id = newGroup("host/opt", "pool");
  HeldProcess process;
  ASSERT_EQ(join(id, process.pid()), kSuccess);
  EXPECT_EQ(create(id, "child").status, kBusy);
  process.end();
  EXPECT_EQ(create(id, "child").status, kSuccess);
}

TEST_F(Members, AGroupThatMayHaveNoMemoryTakesNoProcesses) {
  const int64_t id = newGroup("host/opt", "pool");
  ASSERT_EQ(setMemory(id, {"max=0"}), kSuccess);
  HeldProcess process;
  EXPECT_EQ(join(id, process.pid()), kOutOfMemory);
  EXPECT_EQ(countMembers(id).value, 0);
  ASSERT_EQ(setMemory(id, {"max=-1"}), kSuccess);
  EXPECT_EQ(join(id, process.pid()), kSuccess);
}

TEST_F(Members, AGroupBelowOneThatMayHaveNoMemoryTakesNoProcesses) {
  const int64_t above = newGroup("host/opt", "above");
  newGroup("host/opt/above", "middle");
  const int64_t below = newGroup("host/opt/above/middle", "below");
  ASSERT_EQ(setMemory(above, {"max=0"}), kSuccess);
  HeldProcess process;
  EXPECT_EQ(join(below, process.pid()), kOutOfMemory);
  EXPECT_EQ(countMembers(below).value, 0);
}

TEST_F(Members, WhatIsNoProcessIsNotAskedOfAGroupWithoutMemory) {
  const int64_t id = newGroup("host/opt", "pool");
  ASSERT_EQ(setMemory(id, {"max=0"}), kSuccess);
  EXPECT_EQ(join(id, 0), kOutOfMemory);
  newGroup("host/opt", "parent");
  newGroup("host/opt/parent", "child");
  ASSERT_EQ(setMemory(idOf("host/opt/parent"), {"max=0"}), kSuccess);
  EXPECT_EQ(join(idOf("host/opt/parent"), 0), kBusy) << "its child groups come first";
}

constexpr int kHeldMB = 64;

TEST_F(MemoryInUse, AMaxBelowItIsBusyAndChangesNothing) {
  const int64_t id = newGroup("host/opt", "pool");
  HeldProcess process;
  ASSERT_EQ(join(id, process.pid()), kSuccess);
  process.hold(kHeldMB);
  ASSERT_EQ(setMemory(id, {"min=10", "max=1000"}), kSuccess);
  EXPECT_EQ(setMemory(id, {"min=5", "max=30"}), kMemoryBusy);
  EXPECT_EQ(setMemory(id, {"min=0", "max=0", "minLimit=0", "shares=0"}), kMemoryBusy);
  EXPECT_EQ(memory(id).value, (Settings{10, 1000, -1, -3}));
  EXPECT_EQ(countMembers(id).value, 1) << "nothing is killed";
}

TEST_F(MemoryInUse, AMaxAboveItIsTaken) {
  const int64_t id = newGroup("host/opt", "pool");
  HeldProcess process;
  ASSERT_EQ(join(id, process.pid()), kSuccess);
  process.hold(kHeldMB);
  EXPECT_EQ(setMemory(id, {"max=1000"}), kSuccess);
  EXPECT_EQ(setMemory(id, {"max=-1"}), kSuccess);
}

TEST_F(MemoryInUse, ThatOfAGroupBelowCountsToo) {
  const int64_t parent = newGroup("host/opt", "parent");
  newGroup("host/opt/parent", "middle");
  const int64_t child = newGroup("host/opt/parent/middle", "child");
  HeldProcess process;
  ASSERT_EQ(join(child, process.pid()), kSuccess);
  process.hold(kHeldMB);
  EXPECT_EQ(setMemory(parent, {"max=30"}), kMemoryBusy);
  EXPECT_EQ(setMemory(idOf("host"), {"max=30"}), kMemoryBusy);
  EXPECT_EQ(memory(parent).value, kNewGroup);
}

TEST_F(MemoryInUse, ThatOfAnotherGroupDoesNotCount) {
  const int64_t id = newGroup("host/opt", "pool");
  const int64_t other = newGroup("host/opt", "other");
  newGroup("host/opt/other", "child");
  HeldProcess process;
  ASSERT_EQ(join(id, process.pid()), kSuccess);
  process.hold(kHeldMB);
  EXPECT_EQ(setMemory(other, {"max=0"}), kSuccess);
}

TEST_F(MemoryInUse, ItIsFreeOnceTheProcessEnded) {
  const int64_t id = newGroup("host/opt", "pool");
  HeldProcess process;
  ASSERT_EQ(join(id, process.pid()), kSuccess);
  process.hold(kHeldMB);
  ASSERT_EQ(setMemory(id, {"max=30"}), kMemoryBusy);
  process.end();
  EXPECT_EQ(setMemory(id, {"max=30"}), kSuccess);
}

TEST_F(MemoryInUse, WithoutProcessesAnyMaxIsTaken) {
  EXPECT_EQ(setMemory(newGroup("host/opt", "pool"), {"max=0"}), kSuccess);
}

TEST_F(MemoryInUse, ItDoesNotHinderOtherSettings) {
  const int64_t id = newGroup("host/opt", "pool");
  HeldProcess process;
  ASSERT_EQ(join(id, process.pid()), kSuccess);
  process.hold(kHeldMB);
  EXPECT_EQ(setMemory(id, {"min=1", "minLimit=2", "shares=3"}), kSuccess);
  EXPECT_EQ(setCpu(id, {"max=0"}), kSuccess);
}

TEST_F(MemoryInUse, ABadParameterIsFoundBeforeIt) {
  const int64_t id = newGroup("host/opt", "pool");
  HeldProcess process;
  ASSERT_EQ(join(id, process.pid()), kSuccess);
  process.hold(kHeldMB);
  EXPECT_EQ(setMemory(id, {"min=31", "max=30"}), kBadParameter);
}

}  // namespace
}  // namespace Contract
