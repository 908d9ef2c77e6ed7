// SPDX-License-Identifier: Apache-2.0
// The tree, its ids, and the life of a group.
#include "contract_test.h"
#include "held_process.h"

namespace Contract {
namespace {

using Tree = ContractTest;
using Ids = ContractTest;
using Delete = ContractTest;

TEST_F(Tree, HostAndHostOptExistFromTheStart) {
  EXPECT_EQ(lookUp("host").status, kSuccess);
  EXPECT_EQ(lookUp("host/opt").status, kSuccess);
  EXPECT_GT(idOf("host"), 0);
  EXPECT_NE(idOf("host"), idOf("host/opt"));
}

TEST_F(Tree, NothingElseExistsAtTheStart) {
  EXPECT_EQ(countChildGroups(idOf("host")).value, 1);
  EXPECT_EQ(countChildGroups(idOf("host/opt")).value, 0);
}

TEST_F(Tree, AGroupIsFoundUnderItsPathWithTheIdThatItsCreationGave) {
  const int64_t made = newGroup("host/opt", "pool");
  EXPECT_EQ(idOf("host/opt/pool"), made);
}

TEST_F(Tree, GroupsNestAsDeepAsTheyAreMade) {
  std::string path = "host/opt";
  for (int depth = 0; depth < 40; ++depth) {
    newGroup(path, "level");
    path += "/level";
  }
  EXPECT_EQ(lookUp(path).status, kSuccess);
  EXPECT_EQ(lookUp(path + "/level").status, kNotFound);
}

TEST_F(Tree, AGroupMayStandDirectlyUnderHost) {
  newGroup("host", "system");
  EXPECT_EQ(lookUp("host/system").status, kSuccess);
  EXPECT_EQ(countChildGroups(idOf("host")).value, 2);
}

TEST_F(Tree, OnlyHostIsARoot) {
  newGroup("host/opt", "pool");
  for (const char *path : {"pool", "opt", "opt/pool", "root", "hosts", "Host"}) {
    EXPECT_EQ(lookUp(path).status, kNotFound) << path;
  }
}

TEST_F(Tree, PathsAreComparedByteForByte) {
  newGroup("host/opt", "Pool");
  EXPECT_EQ(lookUp("host/opt/pool").status, kNotFound);
  EXPECT_EQ(lookUp("host/opt/Poo").status, kNotFound);
  EXPECT_EQ(lookUp("host/opt/Pool ").status, kNotFound);
  EXPECT_EQ(lookUp("host/OPT/Pool").status, kNotFound);
}

TEST_F(Tree, ANameOfOddBytesIsAName) {
  const std::string odd = "a b\t\"'\\%_*?\xff\xfe\x01";
  const int64_t made = newGroup("host/opt", odd);
  EXPECT_EQ(idOf("host/opt/" + odd), made);
}

TEST_F(Tree, OneNameMayBeUsedUnderTwoParents) {
  newGroup("host/opt", "a");
  newGroup("host/opt", "b");
  EXPECT_NE(newGroup("host/opt/a", "same"), newGroup("host/opt/b", "same"));
}

// So that a failed unload can rebuild pools below one that is disabled.
TEST_F(Tree, BelowAMaximumOf0GroupsCanBeMadeWhileNothingLives) {
  const int64_t above = newGroup("host/opt", "above");
  const int64_t below = newGroup("host/opt/above", "below");
  ASSERT_EQ(setMemory(above, {"max=0"}), kSuccess);
  for (const int64_t parent : {above, below}) {
    const auto made = create(parent, "pool");
    ASSERT_EQ(made.status, kSuccess);
    EXPECT_EQ(setMemory(made.value, {"max=100", "shares=500"}), kSuccess);
    EXPECT_EQ(setCpu(made.value, {"max=50"}), kSuccess);
    EXPECT_EQ(setMemory(made.value, {"min=1"}), kReservationRefused) << "0 leaves no room";
    EXPECT_EQ(memory(above).value.max, 0);
  }
  EXPECT_EQ(create(above, "below").status, kExists);
  EXPECT_EQ(create(above, "..").status, kBadParameter);
}

TEST_F(Tree, ASecondGroupOfOneNameIsRefusedAndTheFirstStays) {
  const int64_t first = newGroup("host/opt", "pool");
  ASSERT_EQ(setMemory(first, {"min=5"}), kSuccess);
  const auto second = create(idOf("host/opt"), "pool");
  EXPECT_EQ(second.status, kExists);
  EXPECT_EQ(second.value, -1) << "the output is untouched";
  EXPECT_EQ(idOf("host/opt/pool"), first);
  EXPECT_EQ(memory(first).value.min, 5);
}

TEST_F(Tree, AParentThatDoesNotExistIsNotFound) {
  for (const int64_t parent : {int64_t{0}, int64_t{-1}, INT64_MIN, INT64_MAX}) {
    EXPECT_EQ(create(parent, "pool").status, kNotFound) << parent;
  }
}

TEST_F(Tree, ChildGroupsAreCounted) {
  for (int i = 0; i < 300; ++i) newGroup("host/opt", "pool" + std::to_string(i));
  newGroup("host/opt/pool7", "below");
  EXPECT_EQ(countChildGroups(idOf("host/opt")).value, 300);
  EXPECT_EQ(countChildGroups(idOf("host/opt/pool7")).value, 1);
}

TEST_F(Ids, OfADeletedGroupAreNotFoundWhateverIsSet) {
  const int64_t id = newGroup("host/opt", "pool");
  ASSERT_EQ(remove(id), kSuccess);
  for (const char *setting : {"shares=1000", "shares=-9", "min=5", "max=0", "min=-2"}) {
    EXPECT_EQ(setMemory(id, {setting}), kNotFound) << setting;
    EXPECT_EQ(setCpu(id, {setting}), kNotFound) << setting;
  }
}

TEST_F(Ids, EveryCallAboutAGroupThatIsGoneAnswersNotFound) {
  const int64_t id = newGroup("host/opt", "pool");
  ASSERT_EQ(remove(id), kSuccess);
  HeldProcess process;
  EXPECT_EQ(lookUp("host/opt/pool").status, kNotFound);
  EXPECT_EQ(create(id, "below").status, kNotFound);
  EXPECT_EQ(remove(id), kNotFound);
  EXPECT_EQ(memory(id).status, kNotFound);
  EXPECT_EQ(cpu(id).status, kNotFound);
  EXPECT_EQ(setMemory(id, {"min=1"}), kNotFound);
  EXPECT_EQ(setCpu(id, {"min=1"}), kNotFound);
  EXPECT_EQ(countChildGroups(id).status, kNotFound);
  EXPECT_EQ(countMembers(id).status, kNotFound);
  EXPECT_EQ(join(id, process.pid()), kNotFound);
  EXPECT_EQ(peaks(id).status, kNotFound);
}

TEST_F(Ids, TheIdOfADeletedGroupIsNotGivenToAnother) {
  int64_t last = newGroup("host/opt", "pool");
  for (int round = 0; round < 20; ++round) {
    const int64_t id = last;
    ASSERT_EQ(remove(id), kSuccess);
    last = newGroup("host/opt", "pool");
    EXPECT_NE(last, id);
    EXPECT_EQ(memory(id).status, kNotFound);
  }
}

TEST_F(Ids, TheyAreNotReusedByAKernelThatIsStartedAnew) {
  const int64_t before = newGroup("host/opt", "pool");
  kernelUnderTest().startAnew();
  EXPECT_NE(newGroup("host/opt", "pool"), before);
}

TEST_F(Delete, TheFixedGroupsCannotBeDeleted) {
  EXPECT_EQ(remove(idOf("host")), kPermissionDenied);
  EXPECT_EQ(remove(idOf("host/opt")), kPermissionDenied);
  EXPECT_EQ(lookUp("host/opt").status, kSuccess);
}

TEST_F(Delete, AGroupWithChildGroupsIsBusyUntilTheyAreGone) {
  const int64_t parent = newGroup("host/opt", "parent");
  const int64_t child = newGroup("host/opt/parent", "child");
  EXPECT_EQ(remove(parent), kBusy);
  EXPECT_EQ(remove(child), kSuccess);
  EXPECT_EQ(remove(parent), kSuccess);
}

TEST_F(Delete, AGroupWithALivingMemberIsBusyUntilItEnds) {
  const int64_t id = newGroup("host/opt", "pool");
  HeldProcess process;
  ASSERT_EQ(join(id, process.pid()), kSuccess);
  EXPECT_EQ(remove(id), kBusy);
  process.end();
  EXPECT_EQ(remove(id), kSuccess);
}

TEST_F(Delete, ItGivesTheReservationBack) {
  const int64_t first = newGroup("host/opt", "first");
  const int64_t second = newGroup("host/opt", "second");
  const Texts allMemory = {"min=" + std::to_string(kMemoryMB)};
  const Texts allCpu = {"min=" + std::to_string(100 * kCpus)};
  ASSERT_EQ(setMemory(first, allMemory), kSuccess);
  ASSERT_EQ(setCpu(first, allCpu), kSuccess);
  ASSERT_EQ(setMemory(second, {"min=1"}), kReservationRefused);
  ASSERT_EQ(setCpu(second, {"min=1"}), kReservationRefused);
  ASSERT_EQ(remove(first), kSuccess);
  EXPECT_EQ(setMemory(second, allMemory), kSuccess);
  EXPECT_EQ(setCpu(second, allCpu), kSuccess);
}

}  // namespace
}  // namespace Contract
