// SPDX-License-Identifier: Apache-2.0
#include "common/utf8.h"

#include <gtest/gtest.h>

#include <string>

namespace Platform {
namespace {

TEST(Utf8, DecodesTheEndsOfEachLength) {
  struct Case {
    const char *text;
    uint32_t point;
    size_t length;
  };
  for (const Case &each :
       {Case{"\x7f", 0x7F, 1}, Case{"\xc2\x80", 0x80, 2}, Case{"\xdf\xbf", 0x7FF, 2},
        Case{"\xe0\xa0\x80", 0x800, 3}, Case{"\xef\xbf\xbf", 0xFFFF, 3},
        Case{"\xf0\x90\x80\x80", 0x10000, 4}, Case{"\xf4\x8f\xbf\xbf", 0x10FFFF, 4}}) {
    const Utf8Character character = utf8At(each.text, 0);
    EXPECT_EQ(character.point, each.point);
    EXPECT_EQ(character.length, each.length);
  }
}

TEST(Utf8, RefusesOverlongFormsSurrogatesAndPointsBeyondTheLast) {
  for (const char *text :
       {"\xc0\x80", "\xc1\xbf", "\xe0\x9f\xbf", "\xf0\x8f\xbf\xbf", "\xed\xa0\x80", "\xed\xbf\xbf",
        "\xf4\x90\x80\x80", "\xf8\x88\x80\x80\x80"}) {
    EXPECT_EQ(utf8At(text, 0).length, 0U);
    EXPECT_FALSE(isUtf8(text));
  }
}

TEST(Utf8, RefusesASequenceThatIsCutOrHasNoLead) {
  for (const char *text : {"\xc3", "\xe2\x82", "\xf0\x90\x80", "\x80", "\xbf", "\xc3x"}) {
    EXPECT_FALSE(isUtf8(text));
  }
}

TEST(Utf8, TakesWholeTexts) {
  EXPECT_TRUE(isUtf8(""));
  EXPECT_TRUE(isUtf8(std::string("a\0b", 3)));
  EXPECT_TRUE(isUtf8("gr\xc3\xbcn \xf0\x9f\x90\xa6"));
  EXPECT_FALSE(isUtf8("gr\xc3\xbcn \xf0\x9f\x90"));
}

}  // namespace
}  // namespace Platform
