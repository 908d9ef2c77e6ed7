// SPDX-License-Identifier: Apache-2.0
// Texts from outside as the tools print them.
#include "shared/text.h"

#include <gtest/gtest.h>

namespace Tools {
namespace {

TEST(PrintableText, LeavesPlainAndForeignLettersAsTheyAre) {
  EXPECT_EQ(printable(""), "");
  EXPECT_EQ(printable("host/opt a~"), "host/opt a~");
  EXPECT_EQ(printable("gr\xc3\xbcn \xe6\xbc\xa2 \xf0\x9f\x90\xa6"),
            "gr\xc3\xbcn \xe6\xbc\xa2 \xf0\x9f\x90\xa6");
}

TEST(PrintableText, EscapesControlCharacters) {
  EXPECT_EQ(printable("a\tb\nc\rd\x1b[31m\x7f"), "a\\tb\\nc\\x0dd\\x1b[31m\\x7f");
  EXPECT_EQ(printable(std::string("\0", 1)), "\\x00");
  EXPECT_EQ(printable("\xc2\x85"), "\\xc2\\x85");           // next line
  EXPECT_EQ(printable("\xe2\x80\xa8"), "\\xe2\\x80\\xa8");  // line separator
  EXPECT_EQ(printable("\xe2\x80\xae"), "\\xe2\\x80\\xae");  // right-to-left override
}

TEST(PrintableText, EscapesTheBackslashSoThatNoTwoTextsLookAlike) {
  EXPECT_EQ(printable("a\\tb"), "a\\\\tb");
  EXPECT_NE(printable("a\\tb"), printable("a\tb"));
}

TEST(PrintableText, EscapesEachByteThatIsNoUtf8) {
  EXPECT_EQ(printable("\xff"), "\\xff");
  EXPECT_EQ(printable("a\xc3"), "a\\xc3");
  EXPECT_EQ(printable("\xc3(\x80"), "\\xc3(\\x80");
  EXPECT_EQ(printable("\xc0\x80"), "\\xc0\\x80");
  EXPECT_EQ(printable("\xed\xa0\x80"), "\\xed\\xa0\\x80");
  EXPECT_EQ(printable("\xf4\x90\x80\x80"), "\\xf4\\x90\\x80\\x80");
}

TEST(DisplayWidth, CountsColumnsAndNotBytes) {
  EXPECT_EQ(displayWidth(""), 0U);
  EXPECT_EQ(displayWidth("abc"), 3U);
  EXPECT_EQ(displayWidth("gr\xc3\xbcn"), 4U);
  EXPECT_EQ(displayWidth("\xe6\xbc\xa2\xe5\xad\x97"), 4U);
  EXPECT_EQ(displayWidth("u\xcc\x88"), 1U);
  EXPECT_EQ(displayWidth("\xf0\x9f\x90\xa6"), 2U);
}

TEST(PaddedText, IsFilledUpToTheColumns) {
  EXPECT_EQ(padded("ab", 4), "ab  ");
  EXPECT_EQ(padded("abcde", 4), "abcde");
  EXPECT_EQ(padded("\xc3\xbc", 2), "\xc3\xbc ");
}

}  // namespace
}  // namespace Tools
