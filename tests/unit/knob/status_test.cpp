// SPDX-License-Identifier: Apache-2.0
#include "knob/status.h"

#include <gtest/gtest.h>

#include <cctype>
#include <set>
#include <string>
#include <thread>

namespace Knob {
namespace {

TEST(StatusText, EveryStatusOfTheTableHasItsOwn) {
  std::set<std::string> texts;
  std::set<uint32_t> numbers;
  for (const StatusText &row : kStatusTexts) {
    const auto number = static_cast<uint32_t>(row.status);
    EXPECT_STREQ(statusText(number), row.text);
    EXPECT_TRUE(texts.insert(row.text).second) << row.text;
    EXPECT_TRUE(numbers.insert(number).second) << number;
  }
}

TEST(StatusText, TextsAreShortAndBeginInLowerCaseWithoutFullStop) {
  for (const StatusText &row : kStatusTexts) {
    const std::string text = row.text;
    EXPECT_LE(text.size(), 90U) << text;
    EXPECT_TRUE(std::islower(static_cast<unsigned char>(text.front()))) << text;
    EXPECT_NE(text.back(), '.') << text;
    EXPECT_EQ(text.find('\n'), std::string::npos) << text;
  }
}

TEST(StatusText, TheFixedNumbersHoldTheirMeaning) {
  EXPECT_EQ(static_cast<uint32_t>(Status::kSuccess), 0U);
  EXPECT_EQ(static_cast<uint32_t>(Status::kNotFound), 0x0BAD0003U);
  EXPECT_EQ(static_cast<uint32_t>(Status::kBusy), 0x0BAD0004U);
  EXPECT_EQ(static_cast<uint32_t>(Status::kExists), 0x0BAD0005U);
  EXPECT_EQ(static_cast<uint32_t>(Status::kBadParameter), 0x0BAD0007U);
  EXPECT_EQ(static_cast<uint32_t>(Status::kOutOfMemory), 0x0BAD0014U);
  EXPECT_EQ(static_cast<uint32_t>(Status::kMemoryBusy), 0x0BAD0080U);
}

TEST(StatusText, AnUnknownStatusIsShownWithItsNumber) {
  EXPECT_STREQ(statusText(0x0BAD7777), "unknown status 0x0BAD7777");
  EXPECT_STREQ(statusText(1), "unknown status 0x00000001");
  EXPECT_STREQ(statusText(UINT32_MAX), "unknown status 0xFFFFFFFF");
}

TEST(StatusText, EachThreadHasItsOwnUnknownText) {
  const char *mine = statusText(17);
  std::thread([] { (void)statusText(18); }).join();
  EXPECT_STREQ(mine, "unknown status 0x00000011");
}

}  // namespace
}  // namespace Knob
