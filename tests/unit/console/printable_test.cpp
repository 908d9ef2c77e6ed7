// SPDX-License-Identifier: Apache-2.0
#include "console/printable.h"

#include <gtest/gtest.h>

#include <string>

namespace {

using Console::printable;
using namespace std::string_literals;

TEST(Printable, OrdinaryTextIsUnchanged) {
  for (const std::string text :
       {"", "host/opt/a b", "~\\x1b", "\u00e9\u20ac\U0001f600", "\u00a0"}) {
    EXPECT_EQ(text, printable(text));
  }
}

TEST(Printable, ControlCharactersOfAsciiAreEscaped) {
  EXPECT_EQ("\\x00\\x07\\x09\\x0a\\x0d\\x1b[31m\\x7f", printable("\0\a\t\n\r\x1b[31m\x7f"s));
}

TEST(Printable, ControlCharactersBeyondAsciiAreEscaped) {
  EXPECT_EQ("\\xc2\\x9b31m", printable("\u009b31m"));
  EXPECT_EQ("\\xc2\\x80 \\xc2\\x9f \u00a0", printable("\u0080 \u009f \u00a0"));
}

TEST(Printable, StrayBytesThatCouldBeControlsAreEscaped) {
  EXPECT_EQ("\\x9b31m", printable("\x9b"
                                  "31m"));
  EXPECT_EQ("\u00e9\\x9b", printable("\u00e9\x9b"));
}

TEST(Printable, BrokenSequencesHideNoControlCharacter) {
  EXPECT_EQ("\xe2\\x1b", printable("\xe2\x1b"));
  EXPECT_EQ("\xf0\x9f\\x0a", printable("\xf0\x9f\n"));
  EXPECT_EQ("\xc2", printable("\xc2"));
}

}  // namespace
