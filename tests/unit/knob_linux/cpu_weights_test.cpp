// SPDX-License-Identifier: Apache-2.0
// What each group gets of the machine by its weight, by calculation: of single cases, and of
// thousands of random trees.
#include "knob/linux/cpu_weights.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <string>
#include <utility>
#include <vector>

#include "cpu_tree.h"
#include "random_cpu_tree.h"

namespace Knob::Linux {
namespace {

constexpr int kTrees = 10000;
// Of the machine.
constexpr double kReservationTolerance = 0.002, kHostTolerance = 0.005;
constexpr double kRounding = 1e-9;

// Some trees need more than weights from 1 to 10,000 can give, however they are chosen: by how
// much, where host takes all that it may.
double excessOf(const CpuTree &tree) {
  return std::max(0.0, tree.leastHostPart() + 0.001 - tree.hostAllowed());
}

void expectReservationsKept(const CpuTree &tree, double tolerance) {
  for (const CpuTree::Group &group : tree.groups()) {
    if (!group.isBusy || group.level == 0) continue;
    ASSERT_GE(group.part, tree.reserved(group) - tolerance)
        << "a group on level " << group.level << " that reserves " << group.reservation;
  }
}

void expectHostWithinItsPart(const CpuTree &tree) {
  ASSERT_LE(tree[CpuTree::kHost].part, tree.hostAllowed() + kHostTolerance);
}

void expectOthersGetAQuarter(const CpuTree &tree) {
  for (const CpuTree::Group &group : tree.groups()) {
    if (group.reservation != 0 || group.level == 0) continue;
    ASSERT_GE(group.part, group.fair * std::pow(0.25, group.level) - kRounding)
        << "a group on level " << group.level << " with shares of weight " << group.shareWeight;
  }
}

TEST(MachinePart, IsTheReservationsPartOfAllCpus) {
  EXPECT_EQ(machinePart(0, 4), 0U);
  EXPECT_EQ(machinePart(100, 4), kWholeMachine / 4);
  EXPECT_EQ(machinePart(1, 3), kWholeMachine / 300 + 1);
  EXPECT_EQ(machinePart(100, 1000000), kWholeMachine / 1000000 + 1);
}

TEST(MachinePart, OfMoreThanAllCpusIsAllOfThem) {
  EXPECT_EQ(machinePart(400, 4), kWholeMachine);
  EXPECT_EQ(machinePart(401, 4), kWholeMachine);
  EXPECT_EQ(machinePart(INT64_MAX, 1), kWholeMachine);
  EXPECT_EQ(machinePart(100, 0), kWholeMachine);
  EXPECT_EQ(machinePart(-1, 4), 0U);
}

TEST(HostCpu, WithoutReservationsHasTheWeightOfItsShares) {
  EXPECT_EQ(hostCpu({0, 100}, 300).weight, 100);
  EXPECT_EQ(hostCpu({0, 50}, 60000).weight, 50);
  EXPECT_EQ(hostCpu({0, 100}, 300).guaranteed, kWholeMachine / 4);
}

TEST(HostCpu, AloneHasAllOfTheMachine) {
  EXPECT_EQ(hostCpu({kWholeMachine, 100}, 0).weight, 100);
  EXPECT_EQ(hostCpu({kWholeMachine, 100}, 0).guaranteed, kWholeMachine);
}

TEST(HostCpu, AReservationWithinItsFairPartChangesNothing) {
  EXPECT_EQ(hostCpu({machinePart(20, 1), 100}, 200).weight, 100);
}

TEST(HostCpu, ALargerReservationGetsItselfAndATwentiethOfTheRest) {
  const auto host = hostCpu({machinePart(60, 1), 100}, 100);
  EXPECT_EQ(host.weight, 165);  // 62.24 of 100 percent
  EXPECT_NEAR(static_cast<double>(host.guaranteed) / kWholeMachine, 0.6 + 0.02 + 1 / 420.0, 1e-6);
}

TEST(HostCpu, KeepsAReservationUpToTheLargestWeight) {
  const CpuChild host = {machinePart(90, 1), 100};
  EXPECT_EQ(hostCpu(host, 1020).weight, 9993);
  EXPECT_TRUE(hostCpu(host, 1020).keepsReservation);
  EXPECT_FALSE(hostCpu(host, 1021).keepsReservation);
  EXPECT_FALSE(hostCpu({kWholeMachine, 100}, 1).keepsReservation);
  EXPECT_FALSE(hostCpu({machinePart(1, 1), 100}, UINT64_MAX).keepsReservation);
  EXPECT_TRUE(hostCpu({0, 100}, UINT64_MAX).keepsReservation);
}

TEST(HostCpu, BeyondThatHasTheLargestWeight) {
  const HostCpu host = hostCpu({machinePart(90, 1), 100}, 10000);
  EXPECT_EQ(host.weight, 10000);
  EXPECT_EQ(host.guaranteed, kWholeMachine / 2);
}

TEST(CpuDivision, WithoutReservationsLeavesTheWeightsOfTheShares) {
  const CpuDivision division = divideCpu({kWholeMachine / 7, 0, 351, 3});
  EXPECT_EQ(division, CpuDivision());
  for (int64_t weight : {int64_t{1}, int64_t{50}, int64_t{100}, int64_t{10000}}) {
    EXPECT_EQ(cpuWeightOf(division, {0, weight}), weight);
  }
}

TEST(CpuDivision, GivesAnOnlyChildAllOfItsParent) {
  const CpuChild only = {kWholeMachine / 5, 50};
  const CpuDivision division = divideCpu({kWholeMachine / 3, only.reservation, 50, 1});
  EXPECT_EQ(guaranteedPart(division, only), kWholeMachine / 3);
}

TEST(CpuDivision, WithNothingFreeFollowsTheReservationsAlone) {
  const CpuDivision division = divideCpu({kWholeMachine / 2, kWholeMachine / 2, 10200, 3});
  EXPECT_EQ(cpuWeightOf(division, {kWholeMachine / 4, 10000}), 5000);
  EXPECT_EQ(cpuWeightOf(division, {kWholeMachine / 8, 100}), 2500);
  EXPECT_EQ(cpuWeightOf(division, {0, 10000}), 1);
}

TEST(CpuDivision, OfReservationsBeyondTheGuaranteedPartKeepsTheirProportion) {
  const CpuDivision division = divideCpu({kWholeMachine / 100, kWholeMachine, 200, 2});
  EXPECT_EQ(cpuWeightOf(division, {kWholeMachine / 4, 100}), 2500);
  EXPECT_EQ(cpuWeightOf(division, {kWholeMachine / 4 * 3, 100}), 7500);
}

TEST(CpuDivision, StaysWhileAChildChangesLittle) {
  const MachinePart reserved = kWholeMachine / 4, free = kWholeMachine / 10;
  const CpuDivision division = divideCpu({reserved + free, reserved, 2100, 21});
  EXPECT_EQ(divideCpu({reserved + free, reserved + 1000, 2300, 23}), division);
  EXPECT_NE(divideCpu({reserved + free, reserved + free, 2100, 21}), division);
  EXPECT_NE(divideCpu({reserved + free, reserved, 4100, 41}), division);
}

TEST(CpuTree, APoolOf20PercentBesideTwoBusySlicesGetsAThird) {
  CpuTree tree(1);
  const size_t pool = tree.add(tree.add(CpuTree::kHost, 100), 100);
  tree.setMin(pool, 20);
  tree.setOthersWeight(200);
  ASSERT_TRUE(tree.weighAll());
  tree.calculateParts();
  EXPECT_NEAR(tree[pool].part, 1 / 3.0, 0.001);
}

TEST(CpuTree, PoolsOf150And250PercentKeepThemBesideTenSiblings) {
  CpuTree tree(8);
  const size_t opt = tree.add(CpuTree::kHost, 100);
  const size_t small = tree.add(opt, 100), large = tree.add(opt, 100);
  for (int i = 0; i < 10; ++i) tree.add(opt, 100);
  tree.setMin(small, 150);
  tree.setMin(large, 250);
  tree.setOthersWeight(300);
  ASSERT_TRUE(tree.weighAll());
  tree.calculateParts();
  EXPECT_GE(800 * tree[small].part, 150);
  EXPECT_GE(800 * tree[large].part, 250);
}

TEST(CpuTree, APoolOf150PercentBesideADefaultPoolAndASliceTakesItsPart) {
  CpuTree tree(4);
  const size_t opt = tree.add(CpuTree::kHost, 100);
  const size_t pool = tree.add(opt, 100), other = tree.add(opt, 100);
  tree.setMin(pool, 150);
  tree.setOthersWeight(100);
  ASSERT_TRUE(tree.weighAll());
  tree.calculateParts();
  EXPECT_NEAR(400 * tree[CpuTree::kHost].part, 200, 1);
  EXPECT_NEAR(400 * tree[pool].part, 175, 8);
  EXPECT_NEAR(400 * tree[other].part, 25, 8);
}

class RandomCpuTrees : public testing::Test {
 protected:
  template <typename F>
  void forEachTree(Reservations reservations, const F &expect) {
    for (uint64_t seed = 1; seed <= kTrees && !HasFatalFailure(); ++seed) {
      SCOPED_TRACE("tree " + std::to_string(seed));
      Random random(seed);
      CpuTree tree = randomCpuTree(random, reservations);
      tree.calculateParts();
      expect(tree, random);
    }
  }
};

TEST_F(RandomCpuTrees, EveryReservationIsKeptWhileAllAreBusy) {
  int beyondWeights = 0;
  forEachTree(Reservations::kSpread, [&](CpuTree &tree, Random &) {
    const double excess = excessOf(tree);
    if (excess > 0) ++beyondWeights;
    expectReservationsKept(tree, kReservationTolerance + excess);
  });
  EXPECT_LE(beyondWeights, kTrees / 100);
}

TEST_F(RandomCpuTrees, EveryReservationIsKeptWhileSomeAreIdle) {
  forEachTree(Reservations::kSpread, [&](CpuTree &tree, Random &random) {
    for (size_t i = 0; i < tree.groups().size(); ++i) tree.setBusy(i, random.oneIn(2));
    tree.calculateParts();
    expectReservationsKept(tree, kReservationTolerance + excessOf(tree));
  });
}

TEST_F(RandomCpuTrees, AFewLargeReservationsMissAtMostSixTenthsOfAPercent) {
  forEachTree(Reservations::kConcentrated, [&](CpuTree &tree, Random &) {
    expectReservationsKept(tree, 0.006 + excessOf(tree));
  });
}

TEST_F(RandomCpuTrees, HostTakesNoMoreThanItsPart) {
  for (Reservations reservations : {Reservations::kSpread, Reservations::kConcentrated}) {
    forEachTree(reservations, [](CpuTree &tree, Random &) { expectHostWithinItsPart(tree); });
  }
}

TEST_F(RandomCpuTrees, AGroupWithoutAReservationGetsAQuarterOfItsFairPart) {
  for (Reservations reservations : {Reservations::kSpread, Reservations::kConcentrated}) {
    forEachTree(reservations, [](CpuTree &tree, Random &) { expectOthersGetAQuarter(tree); });
  }
}

// One change after another, each followed by writing only what the rule asks for.
class History {
 public:
  explicit History(uint64_t seed) : random_(seed), tree_(kCpus) {
    groups_.push_back(tree_.add(CpuTree::kHost, 100));
    tree_.setOthersWeight(300);
  }

  void step() {
    const size_t group = groups_[static_cast<size_t>(random_.from(0, count() - 1))];
    switch (random_.from(0, 5)) {
      case 0:
      case 1:
        return addBelow(group);
      case 2:
        return removeAny(group);
      case 3:
        tree_.setShareWeight(group, randomShareWeight(random_));
        ASSERT_TRUE(tree_.settle(group));
        return;
      case 4:
        return changeMin(group, random_.oneIn(3) ? 0 : random_.from(1, 90 * kCpus / 4));
      default:
        return changeOthers(static_cast<uint64_t>(random_.from(1, 600)));
    }
  }

  CpuTree &tree() { return tree_; }

 private:
  static constexpr uint32_t kCpus = 16;
  static constexpr int64_t kMaxReserved = 90 * kCpus;

  int64_t count() const { return static_cast<int64_t>(groups_.size()); }

  void addBelow(size_t parent) {
    if (tree_[parent].level == 4) return;
    groups_.push_back(tree_.add(parent, randomShareWeight(random_)));
    ASSERT_TRUE(tree_.settle(groups_.back()));
  }

  void removeAny(size_t group) {
    if (!tree_[group].children.empty() || group == groups_.front()) return;
    tree_.remove(group);
    groups_.erase(std::find(groups_.begin(), groups_.end(), group));
    ASSERT_TRUE(tree_.settle(tree_[group].parent));
  }

  void changeMin(size_t group, int64_t percent) {
    const int64_t before = tree_[group].min;
    tree_.setMin(group, percent);
    if (tree_[CpuTree::kHost].reservation > kMaxReserved || !tree_.settle(group)) {
      tree_.setMin(group, before);
    }
  }

  void changeOthers(uint64_t weight) {
    const uint64_t before = std::exchange(othersWeight_, weight);
    tree_.setOthersWeight(weight);
    if (tree_.settle(CpuTree::kHost)) return;
    tree_.setOthersWeight(othersWeight_ = before);
  }

  Random random_;
  CpuTree tree_;
  std::vector<size_t> groups_;  // without host
  uint64_t othersWeight_ = 300;
};

void expectSameWeights(const CpuTree &tree, CpuTree anew) {
  ASSERT_TRUE(anew.weighAll());
  std::vector<size_t> groups = {CpuTree::kHost};
  for (size_t next = 0; next < groups.size(); ++next) {
    const size_t group = groups[next];
    ASSERT_EQ(tree[group].weight, anew[group].weight) << "group " << group;
    ASSERT_EQ(tree[group].division, anew[group].division) << "group " << group;
    groups.insert(groups.end(), tree[group].children.begin(), tree[group].children.end());
  }
}

TEST(CpuHistories, AfterEachChangeAllWeightsAreAsIfWrittenAnew) {
  for (uint64_t seed = 1; seed <= 200; ++seed) {
    SCOPED_TRACE("history " + std::to_string(seed));
    History history(seed);
    for (int step = 0; step < 200; ++step) {
      ASSERT_NO_FATAL_FAILURE(history.step());
      ASSERT_NO_FATAL_FAILURE(expectSameWeights(history.tree(), history.tree()));
    }
  }
}

TEST(CpuHistories, EndWithWhatIsPromised) {
  for (uint64_t seed = 1001; seed <= 3000; ++seed) {
    SCOPED_TRACE("history " + std::to_string(seed));
    History history(seed);
    for (int step = 0; step < 200; ++step) ASSERT_NO_FATAL_FAILURE(history.step());
    history.tree().calculateParts();
    expectHostWithinItsPart(history.tree());
    expectReservationsKept(history.tree(), kReservationTolerance + excessOf(history.tree()));
    expectOthersGetAQuarter(history.tree());
  }
}

TEST(CpuHistories, AThousandNewSiblingsRewriteTheirGroupFewTimes) {
  CpuTree tree(4);
  const size_t opt = tree.add(CpuTree::kHost, 100);
  tree.setMin(tree.add(opt, 100), 150);
  tree.setOthersWeight(300);
  ASSERT_TRUE(tree.weighAll());
  for (int i = 0; i < 1000; ++i) ASSERT_TRUE(tree.settle(tree.add(opt, 100)));
  EXPECT_LE(tree.rewrites(), 20U);
  EXPECT_LE(tree.writes(), 4000U);
}

TEST(CpuHistories, AThousandNewReservationsRewriteTheirGroupFewTimes) {
  CpuTree tree(100);
  const size_t opt = tree.add(CpuTree::kHost, 100);
  tree.add(CpuTree::kHost, 100);
  tree.setOthersWeight(300);
  ASSERT_TRUE(tree.weighAll());
  for (int i = 0; i < 1000; ++i) {
    const size_t pool = tree.add(opt, 100);
    tree.setMin(pool, 9);
    ASSERT_TRUE(tree.settle(pool));
  }
  EXPECT_LE(tree.rewrites(), 100U);
  EXPECT_LE(tree.writes(), 25000U);
}

}  // namespace
}  // namespace Knob::Linux
