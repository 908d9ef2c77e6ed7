// SPDX-License-Identifier: Apache-2.0
// The rules that every kernel shares, as plain functions.
#include <gtest/gtest.h>

#include "knob/admission.h"
#include "knob/allocation.h"
#include "knob/names.h"
#include "knob/peaks.h"

namespace Knob {
namespace {

Status statusOf(const std::function<void()> &call) {
  try {
    call();
  } catch (const KernelError &error) {
    return error.status;
  }
  return Status::kSuccess;
}

TEST(Names, ANulIsNoNameAlthoughNoCallCanBringOne) {
  EXPECT_FALSE(isGroupName(std::string_view("a\0b", 3)));
  EXPECT_FALSE(isGroupName(std::string_view("\0", 1)));
}

TEST(Names, TheLengthEndsAt255Bytes) {
  EXPECT_TRUE(isGroupName(std::string(255, 'n')));
  EXPECT_FALSE(isGroupName(std::string(256, 'n')));
  EXPECT_FALSE(isGroupName(""));
}

TEST(Names, APathSplitsAtEverySlash) {
  using Components = std::vector<std::string_view>;
  EXPECT_EQ(splitPath("host"), Components{"host"});
  EXPECT_EQ(splitPath("host/opt/a b"), (Components{"host", "opt", "a b"}));
  for (const char *bad : {"", "/", "host/", "/host", "host//opt", "host/..", "host/cpu.max/a"}) {
    EXPECT_FALSE(splitPath(bad)) << bad;
  }
}

TEST(Settings, EachSettingHasItsField) {
  const auto change =
      parseAllocationChange(Resource::kMemory, {"shares=4", "minLimit=3", "max=2", "min=1"});
  EXPECT_EQ(change.min, 1);
  EXPECT_EQ(change.max, 2);
  EXPECT_EQ(change.minLimit, 3);
  EXPECT_EQ(change.shares, 4);
}

TEST(Settings, WhatIsNotGivenIsAbsent) {
  const auto change = parseAllocationChange(Resource::kCpu, {"max=2"});
  EXPECT_FALSE(change.min || change.minLimit || change.shares);
}

TEST(Settings, MemoryTakesEvery64BitNumberAndCpuEvery32BitOne) {
  EXPECT_EQ(parseAllocationChange(Resource::kMemory, {"min=-9223372036854775808"}).min, INT64_MIN);
  EXPECT_EQ(parseAllocationChange(Resource::kMemory, {"min=9223372036854775807"}).min, INT64_MAX);
  EXPECT_EQ(parseAllocationChange(Resource::kCpu, {"min=-2147483648"}).min, INT32_MIN);
  EXPECT_EQ(parseAllocationChange(Resource::kCpu, {"min=2147483647"}).min, INT32_MAX);
  for (const char *entry : {"min=9223372036854775808", "min=-9223372036854775809"}) {
    EXPECT_EQ(statusOf([&] { (void)parseAllocationChange(Resource::kMemory, {entry}); }),
              Status::kBadParameter);
  }
}

TEST(Settings, ARefusalSaysWhichEntryAndWhy) {
  try {
    (void)parseAllocationChange(Resource::kMemory, {"min=5", "max=x"});
    FAIL();
  } catch (const KernelError &error) {
    EXPECT_STREQ(error.what(), "\"max=x\": not a decimal number of 64 bits");
  }
}

constexpr int64_t kMax = INT64_MAX;

ResourceState state(int64_t min, int64_t max, int64_t minLimit, int64_t childrenSum) {
  return {{min, max, minLimit, -3}, childrenSum};
}

std::optional<std::vector<int64_t>> sumsAfter(std::vector<ResourceState> states, int64_t wantedMin,
                                              int64_t capacity) {
  Allocation wanted = states.front().allocation;
  wanted.min = wantedMin;
  const auto admitted = admit(std::move(states), wanted, capacity);
  if (!admitted) return std::nullopt;
  std::vector<int64_t> sums;
  for (const ResourceState &each : *admitted) sums.push_back(each.childrenSum);
  return sums;
}

using Sums = std::vector<int64_t>;

TEST(Admission, TheLargerOfOwnMinAndChildrenIsReserved) {
  EXPECT_EQ(reservationOf(state(5, -1, -1, 3)), 5);
  EXPECT_EQ(reservationOf(state(3, -1, -1, 5)), 5);
}

TEST(Admission, ARefusalNamesTheGroupAndBothAmounts) {
  Refusal refusal{};
  const auto refusedAt = [&](const std::vector<ResourceState> &states, int64_t min) {
    Allocation wanted = states.front().allocation;
    wanted.min = min;
    EXPECT_FALSE(admit(states, wanted, 100, &refusal));
    return refusal.at;
  };
  EXPECT_EQ(refusedAt({state(2, -1, 10, 0)}, 15), 0U);
  EXPECT_EQ(refusal.asked, 13);
  EXPECT_EQ(refusal.free, 8);
  EXPECT_EQ(refusedAt({state(0, -1, -1, 0), state(0, 40, -1, 30)}, 15), 1U);
  EXPECT_EQ(refusal.asked, 15);
  EXPECT_EQ(refusal.free, 10);
  EXPECT_EQ(refusedAt({state(0, -1, -1, 0), state(0, -1, -1, 90)}, 15), 2U) << "the machine";
  EXPECT_EQ(refusal.asked, 15);
  EXPECT_EQ(refusal.free, 10);
}

TEST(Admission, ASumNeverGoesBelow0) {
  EXPECT_EQ(changedSum(10, 99, 3), 3);
  EXPECT_EQ(changedSum(10, 4, 0), 6);
}

TEST(Admission, TheMachineHas100PercentForEachCpuAndItsWholeMegabytes) {
  HostFacts facts;
  facts.cpus = 3;
  facts.memoryKB = 4095;
  EXPECT_EQ(machineCapacity(facts, Resource::kCpu), 300);
  EXPECT_EQ(machineCapacity(facts, Resource::kMemory), 3);
  facts.cpus = UINT32_MAX;
  facts.memoryKB = UINT64_MAX;
  EXPECT_EQ(machineCapacity(facts, Resource::kCpu), int64_t{UINT32_MAX} * 100);
  EXPECT_EQ(machineCapacity(facts, Resource::kMemory), (int64_t{1} << 54) - 1);
}

TEST(Admission, EveryLevelAboveCountsTheChange) {
  EXPECT_EQ(sumsAfter({state(2, -1, -1, 0), state(0, -1, -1, 10), state(0, -1, -1, 30)}, 5, 100),
            (Sums{0, 13, 33}));
}

TEST(Admission, ItEndsWhereALevelsOwnMinCoversTheChange) {
  EXPECT_EQ(sumsAfter({state(2, -1, -1, 0), state(50, -1, -1, 10), state(0, -1, -1, 60)}, 5, 100),
            (Sums{0, 13}));
}

TEST(Admission, AnUnchangedReservationTouchesNothingAbove) {
  EXPECT_EQ(sumsAfter({state(2, -1, -1, 20), state(0, -1, -1, 20)}, 7, 1), (Sums{20}));
}

TEST(Admission, ShrinkingIsAlwaysAdmitted) {
  // A machine that lost memory, and a parent whose limit is below what it holds.
  EXPECT_EQ(sumsAfter({state(50, -1, -1, 0), state(0, 10, 10, 90)}, 40, 20), (Sums{0, 80}));
}

TEST(Admission, SumsSaturate) {
  EXPECT_EQ(sumsAfter({state(1, -1, -1, 0), state(0, -1, -1, 10)}, kMax, 100), std::nullopt);
  EXPECT_EQ(sumsAfter({state(1, -1, -1, 0), state(0, -1, -1, 10)}, kMax, kMax), (Sums{0, kMax}));
}

TEST(Admission, EachLimitRefusesOneAboveIt) {
  EXPECT_TRUE(sumsAfter({state(0, 5, -1, 0)}, 5, 100));
  EXPECT_FALSE(sumsAfter({state(0, 5, -1, 0)}, 6, 100));
  EXPECT_FALSE(sumsAfter({state(0, -1, 5, 0)}, 6, 100));
  EXPECT_FALSE(sumsAfter({state(0, -1, -1, 0), state(0, 5, -1, 0)}, 6, 100));
  EXPECT_FALSE(sumsAfter({state(0, -1, -1, 0), state(0, -1, 5, 0)}, 6, 100));
  EXPECT_TRUE(sumsAfter({state(0, -1, -1, 0), state(0, -1, -1, 0)}, 100, 100));
  EXPECT_FALSE(sumsAfter({state(0, -1, -1, 0), state(0, -1, -1, 0)}, 101, 100));
}

TEST(Peaks, MegabytesBecomeKilobytesAndSaturate) {
  EXPECT_EQ(kilobytes(0), 0U);
  EXPECT_EQ(kilobytes(3), 3072U);
  EXPECT_EQ(kilobytes(INT64_MAX), UINT64_MAX);
  EXPECT_EQ(kilobytes((int64_t{1} << 54) - 1), UINT64_MAX - 1023);
  EXPECT_EQ(kilobytes(int64_t{1} << 54), UINT64_MAX);
}

TEST(Peaks, TheyNeverFall) {
  const MemoryStatistics raised = raisedPeaks({2048, 1024}, 1, 2);
  EXPECT_EQ(raised.ownReservedPeakKB, 2048U);
  EXPECT_EQ(raised.childrenReservedPeakKB, 2048U);
}

}  // namespace
}  // namespace Knob
