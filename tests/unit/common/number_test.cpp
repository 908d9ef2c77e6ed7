// SPDX-License-Identifier: Apache-2.0
#include "common/number.h"

#include <gtest/gtest.h>

#include <cstdint>

namespace Platform {
namespace {

TEST(Number, ReadsTheWholeTextAsDecimal) {
  EXPECT_EQ(parseNumber<int64_t>("0"), 0);
  EXPECT_EQ(parseNumber<int64_t>("-7"), -7);
  EXPECT_EQ(parseNumber<int64_t>("007"), 7);
  EXPECT_EQ(parseNumber<uint64_t>("18446744073709551615"), UINT64_MAX);
  EXPECT_EQ(parseNumber<int64_t>("-9223372036854775808"), INT64_MIN);
}

TEST(Number, RefusesWhatIsNotOnlyANumber) {
  for (const char *text : {"", "-", "+1", " 1", "1 ", "1x", "0x1", "1.0", "1e3", "--1"}) {
    EXPECT_EQ(parseNumber<int64_t>(text), std::nullopt) << text;
  }
}

TEST(Number, RefusesWhatTheTypeCannotHold) {
  EXPECT_EQ(parseNumber<int32_t>("2147483647"), INT32_MAX);
  EXPECT_EQ(parseNumber<int32_t>("2147483648"), std::nullopt);
  EXPECT_EQ(parseNumber<int64_t>("9223372036854775808"), std::nullopt);
  EXPECT_EQ(parseNumber<uint64_t>("-1"), std::nullopt);
}

}  // namespace
}  // namespace Platform
