// SPDX-License-Identifier: Apache-2.0
// The texts of control files at both ends of each range, and nonsense in them.
#include "knob/linux/control_values.h"

#include <gtest/gtest.h>

namespace Knob::Linux {
namespace {

constexpr int64_t kMaxInt64 = std::numeric_limits<int64_t>::max();
constexpr int64_t kMaxPercent = std::numeric_limits<int32_t>::max();

TEST(MemoryText, IsInBytes) {
  EXPECT_EQ(memoryText(0), "0");
  EXPECT_EQ(memoryText(1), "1048576");
  EXPECT_EQ(memoryText(4096), "4294967296");
}

TEST(MemoryText, NoLimitIsMax) {
  EXPECT_EQ(memoryText(-1), "max");
}

TEST(MemoryText, TheLargestThatLinuxCountsIsANumberAndOneMoreIsMax) {
  EXPECT_EQ(memoryText((int64_t{1} << 43) - 1), "9223372036853727232");
  EXPECT_EQ(memoryText(int64_t{1} << 43), "max");
  EXPECT_EQ(memoryText(kMaxInt64), "max");
}

TEST(CpuMaxText, IsAQuotaOfATenthOfASecond) {
  EXPECT_EQ(cpuMaxText(100), "100000 100000");
  EXPECT_EQ(cpuMaxText(350), "350000 100000");
  EXPECT_EQ(cpuMaxText(kMaxPercent), "2147483647000 100000");
}

TEST(CpuMaxText, NoLimitIsMax) {
  EXPECT_EQ(cpuMaxText(-1), "max 100000");
}

TEST(CpuMaxText, ZeroIsTheSmallestQuotaOfLinux) {
  EXPECT_EQ(cpuMaxText(0), "1000 100000");
  EXPECT_EQ(cpuMaxText(1), "1000 100000");
  EXPECT_EQ(cpuMaxText(2), "2000 100000");
}

TEST(WeightOfShares, HasAWeightForEachLevel) {
  EXPECT_EQ(weightOfShares(-2), 50);
  EXPECT_EQ(weightOfShares(-3), 100);
  EXPECT_EQ(weightOfShares(-4), 200);
}

TEST(WeightOfShares, IsATenthOfANumberWithinTheRangeOfLinux) {
  EXPECT_EQ(weightOfShares(0), 1);
  EXPECT_EQ(weightOfShares(19), 1);
  EXPECT_EQ(weightOfShares(20), 2);
  EXPECT_EQ(weightOfShares(29), 2);
  EXPECT_EQ(weightOfShares(1000), 100);
  EXPECT_EQ(weightOfShares(99999), 9999);
  EXPECT_EQ(weightOfShares(100000), 10000);
  EXPECT_EQ(weightOfShares(kMaxInt64), 10000);
}

TEST(Shares, EveryWeightReadsBackAsSharesThatGiveIt) {
  for (uint64_t weight = 1; weight <= 10000; ++weight) {
    EXPECT_EQ(weightOfShares(sharesOfWeight(weight)), static_cast<int64_t>(weight));
  }
}

TEST(Shares, TheThreeLevelsHaveTheirNames) {
  EXPECT_EQ(sharesOfWeight(50), -2);
  EXPECT_EQ(sharesOfWeight(100), -3);
  EXPECT_EQ(sharesOfWeight(200), -4);
  EXPECT_EQ(sharesOfWeight(51), 510);
}

TEST(Limit, IsANumberOrMax) {
  EXPECT_EQ(parseLimit("0\n"), 0U);
  EXPECT_EQ(parseLimit("1048576"), 1048576U);
  EXPECT_EQ(parseLimit("max\n"), kUnlimited);
  EXPECT_EQ(parseLimit("18446744073709551615"), kUnlimited);
}

TEST(Limit, NothingElseIs) {
  for (const char *text :
       {"", "\n", "-1", "+1", "1 2", "1k", "maximum", "0x10", "18446744073709551616"}) {
    EXPECT_FALSE(parseLimit(text)) << text;
  }
}

TEST(CpuMax, IsReadAsPercentOfItsOwnPeriod) {
  EXPECT_EQ(parseCpuMax("100000 100000\n"), 100);
  EXPECT_EQ(parseCpuMax("25000 50000"), 50);
  EXPECT_EQ(parseCpuMax("1999 100000"), 1);
  EXPECT_EQ(parseCpuMax("max 100000\n"), -1);
  EXPECT_EQ(parseCpuMax("0 100000"), 0);
}

TEST(CpuMax, NothingElseIs) {
  for (const char *text : {"", "max", "1000", "1000 0", "1000 max", "x 1000", "1000 x", " "}) {
    EXPECT_FALSE(parseCpuMax(text)) << text;
  }
}

TEST(Megabytes, AMinimumIsRoundedUpAndAMaximumDown) {
  EXPECT_EQ(minimumMegabytes(0), 0);
  EXPECT_EQ(minimumMegabytes(1), 1);
  EXPECT_EQ(minimumMegabytes(1048576), 1);
  EXPECT_EQ(minimumMegabytes(1048577), 2);
  EXPECT_EQ(minimumMegabytes(kUnlimited), int64_t{1} << 44);
  EXPECT_EQ(maximumMegabytes(1048575), 0);
  EXPECT_EQ(maximumMegabytes(2097151), 1);
  EXPECT_EQ(maximumMegabytes(kUnlimited), -1);
}

TEST(Megabytes, WhatIsWrittenReadsBack) {
  for (int64_t megabytes : {int64_t{0}, int64_t{1}, int64_t{4095}, (int64_t{1} << 43) - 1}) {
    const auto bytes = parseLimit(memoryText(megabytes));
    ASSERT_TRUE(bytes);
    EXPECT_EQ(minimumMegabytes(*bytes), megabytes);
    EXPECT_EQ(maximumMegabytes(*bytes), megabytes);
  }
}

TEST(KeyedValue, IsFoundByItsWholeKeyAtALinesStart) {
  constexpr const char *kText = "populated 1\nfrozen 0\nusage_usec 123456\n";
  EXPECT_EQ(keyedValue(kText, "populated"), 1U);
  EXPECT_EQ(keyedValue(kText, "frozen"), 0U);
  EXPECT_EQ(keyedValue(kText, "usage_usec"), 123456U);
  EXPECT_FALSE(keyedValue(kText, "usage"));
  EXPECT_FALSE(keyedValue(kText, "ulated"));
  EXPECT_FALSE(keyedValue("populated\n", "populated"));
  EXPECT_FALSE(keyedValue("", "populated"));
}

TEST(Word, IsFoundWholeOnly) {
  EXPECT_TRUE(hasWord("cpuset cpu io memory\n", "cpu"));
  EXPECT_TRUE(hasWord("cpuset cpu io memory\n", "memory"));
  EXPECT_FALSE(hasWord("cpuset io\n", "cpu"));
  EXPECT_FALSE(hasWord("", "cpu"));
}

}  // namespace
}  // namespace Knob::Linux
