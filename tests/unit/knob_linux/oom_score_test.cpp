// SPDX-License-Identifier: Apache-2.0
// The oom_score_adj of a minimum.
#include "knob/linux/oom_score.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdint>
#include <limits>

namespace Knob::Linux {
namespace {

constexpr uint64_t kMegabyte = uint64_t{1024} * 1024;

TEST(OomScoreAdj, IsTheMinimumsPartOfTheMachineInThousandths) {
  EXPECT_EQ(oomScoreAdjFor(120, 1000 * kMegabyte), -120);
  EXPECT_EQ(oomScoreAdjFor(500, 2000 * kMegabyte), -250);
}

TEST(OomScoreAdj, IsRoundedAwayFromZero) {
  EXPECT_EQ(oomScoreAdjFor(1, 1000000 * kMegabyte), -1);
  EXPECT_EQ(oomScoreAdjFor(121, 999 * kMegabyte), -122);
}

TEST(OomScoreAdj, Is0WithoutAMinimum) {
  EXPECT_EQ(oomScoreAdjFor(0, 1000 * kMegabyte), 0);
}

TEST(OomScoreAdj, IsNeverThatOfAProcessThatCannotBeKilled) {
  EXPECT_EQ(oomScoreAdjFor(1000, 1000 * kMegabyte), -999);
  EXPECT_EQ(oomScoreAdjFor(999999, 1000 * kMegabyte), -999);
  EXPECT_EQ(oomScoreAdjFor(std::numeric_limits<int64_t>::max(), 1000 * kMegabyte), -999);
  EXPECT_EQ(oomScoreAdjFor(1, 0), -999);
}

TEST(OomScoreAdj, OfAProcessThatHasEndedIsNothing) {
  EXPECT_FALSE(readOomScoreAdj(std::numeric_limits<int32_t>::max()));
  EXPECT_TRUE(readOomScoreAdj(::getpid()));
  EXPECT_TRUE(changeOomScoreAdj(std::numeric_limits<int32_t>::max(), 0, -5));
}

}  // namespace
}  // namespace Knob::Linux
