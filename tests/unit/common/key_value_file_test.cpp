// SPDX-License-Identifier: Apache-2.0
#include "common/key_value_file.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include "temp_folder.h"

namespace Platform {
namespace {

using testing::HasSubstr;
using testing::StartsWith;

KeyValueFile parse(std::string_view text) {
  return KeyValueFile::parse(text, "x.conf", {"name", "path", "count"});
}

std::string refusalOf(std::string_view text) {
  try {
    (void)parse(text);
  } catch (const ConfigError &error) {
    return error.what();
  }
  return "accepted";
}

TEST(KeyValueFile, AnEmptyFileGivesNothing) {
  EXPECT_FALSE(parse("").text("name"));
  EXPECT_FALSE(parse("\n\n \t\n").text("name"));
}

TEST(KeyValueFile, BlanksAroundKeyAndValueDoNotCount) {
  EXPECT_EQ(parse("  name \t =\t some value \r\n").text("name"), "some value");
  EXPECT_EQ(parse("name=value").text("name"), "value");
}

TEST(KeyValueFile, TheFirstEqualsSignEndsTheKey) {
  EXPECT_EQ(parse("name = a=b=c").text("name"), "a=b=c");
}

TEST(KeyValueFile, ACommentBeginsAtTheLineOrAfterABlank) {
  const auto file = parse("# name = no\n  # name = no\nname = yes # because\npath = /a#b\n");
  EXPECT_EQ(file.text("name"), "yes");
  EXPECT_EQ(file.text("path"), "/a#b");
}

TEST(KeyValueFile, ALineWithoutEqualsSignIsAnErrorWithFileAndLine) {
  EXPECT_EQ(refusalOf("name = a\n\nwhat is this\n"), "x.conf:3: no '=' in \"what is this\"");
}

TEST(KeyValueFile, AnUnknownKeyIsAnErrorThatNamesTheKnownOnes) {
  EXPECT_EQ(refusalOf("nmae = a"), "x.conf:1: unknown key \"nmae\" (known: name, path, count)");
  EXPECT_THAT(refusalOf("Name = a"), HasSubstr("unknown key"));
  EXPECT_THAT(refusalOf("= a"), HasSubstr("unknown key \"\""));
}

TEST(KeyValueFile, AKeyWithoutValueIsAnError) {
  EXPECT_EQ(refusalOf("name ="), "x.conf:1: name: no value");
  EXPECT_EQ(refusalOf("name = # nothing"), "x.conf:1: name: no value");
}

TEST(KeyValueFile, AKeyGivenTwiceIsAnErrorEvenWithTheSameValue) {
  EXPECT_EQ(refusalOf("name = a\npath = /\nname = a"), "x.conf:3: name: already given in line 1");
}

TEST(KeyValueFile, ANulByteIsAnError) {
  EXPECT_EQ(refusalOf(std::string_view("name = a\0b", 10)), "x.conf:1: NUL byte in the line");
}

TEST(KeyValueFile, AValueOutsideTheChoicesIsAnError) {
  const auto file = parse("\nname = green\n");
  EXPECT_EQ(file.oneOf("name", {"red", "green"}), "green");
  EXPECT_FALSE(file.oneOf("path", {"red", "green"}));
  try {
    (void)file.oneOf("name", {"red", "blue"});
    FAIL();
  } catch (const ConfigError &error) {
    EXPECT_STREQ(error.what(), "x.conf:2: name: bad value \"green\" (one of: red, blue)");
  }
}

TEST(KeyValueFile, ANumberIsWholeAndWithinItsBounds) {
  EXPECT_EQ(parse("count = 7").integer("count", 0, 7), 7);
  EXPECT_EQ(parse("count = -7").integer("count", -7, 0), -7);
  EXPECT_FALSE(parse("").integer("count", 0, 7));
  for (const char *value :
       {"8", "-1", "x", "7x", "+7", "7.0", "0x7", "99999999999999999999", "7 7"}) {
    EXPECT_THROW((void)parse("count = " + std::string(value)).integer("count", 0, 7), ConfigError)
        << value;
  }
}

TEST(KeyValueFile, APathBeginsAtTheRoot) {
  EXPECT_EQ(parse("path = /a b").absolutePath("path"), "/a b");
  EXPECT_FALSE(parse("").absolutePath("path"));
  EXPECT_THROW((void)parse("path = a").absolutePath("path"), ConfigError);
}

TEST(KeyValueFile, ARefusalOfAKeyThatIsNotGivenNamesTheFile) {
  try {
    parse("").refuse("name", "is needed");
  } catch (const ConfigError &error) {
    EXPECT_STREQ(error.what(), "x.conf: name: is needed");
  }
}

TEST(KeyValueFile, AFileThatDoesNotExistIsNone) {
  const ::Test::TempFolder folder;
  EXPECT_FALSE(KeyValueFile::read(folder.path() / "none", {"name"}));
}

TEST(KeyValueFile, AFileIsReadWithItsNameInTheErrors) {
  const ::Test::TempFolder folder;
  const std::string name = folder.path() / "x.conf";
  ::Test::writeFile(name, "name = a\n");
  EXPECT_EQ(KeyValueFile::read(name, {"name"})->text("name"), "a");
  ::Test::writeFile(name, "bad\n");
  try {
    (void)KeyValueFile::read(name, {"name"});
    FAIL();
  } catch (const ConfigError &error) {
    EXPECT_THAT(error.what(), StartsWith(name + ":1: "));
  }
}

TEST(KeyValueFile, WhatCannotBeReadIsAnError) {
  const ::Test::TempFolder folder;
  EXPECT_THROW((void)KeyValueFile::read(folder.path(), {"name"}), ConfigError);
  ::Test::writeFile(folder.path() / "large", std::string((1 << 20) + 1, '#'));
  EXPECT_THROW((void)KeyValueFile::read(folder.path() / "large", {"name"}), ConfigError);
}

}  // namespace
}  // namespace Platform
