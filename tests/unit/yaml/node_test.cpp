// SPDX-License-Identifier: Apache-2.0
// Values out of YAML nodes, with every release of the yaml library.
#include "yaml/node.h"

#include <gtest/gtest.h>

#include <string>

#include "yaml_support.h"

namespace {

using BadString = YAML::TypedBadConversion<std::string>;

const char *const kNullWords[] = {"~", "null", "Null", "NULL"};

// Releases up to 0.6 report a plain null word under a tag as an untagged null, and a quoted one as
// a tagged scalar. Later ones report both as the same tagged scalar.
bool libraryTellsQuotedNulls() {
  return yaml("!tag ~").IsNull();
}

TEST(YamlNode, PlainNullWordIsNull) {
  for (const std::string word : kNullWords) {
    EXPECT_TRUE(Yaml::isNull(yaml(word))) << word;
    EXPECT_TRUE(Yaml::isNull(yaml("!tag " + word))) << word;
    EXPECT_EQ("", Yaml::tagOf(yaml("!tag " + word))) << word;
  }
}

TEST(YamlNode, QuotedNullWordIsAText) {
  for (const std::string word : kNullWords) {
    const YAML::Node quoted = yaml("'" + word + "'");
    EXPECT_FALSE(Yaml::isNull(quoted)) << word;
    EXPECT_EQ("!", Yaml::tagOf(quoted)) << word;
    EXPECT_EQ(word, Yaml::scalarText(quoted));
  }
}

TEST(YamlNode, TaggedQuotedNullWordIsATextWhereTheLibraryTells) {
  for (const std::string word : kNullWords) {
    const YAML::Node quoted = yaml("!tag '" + word + "'");
    EXPECT_EQ(!libraryTellsQuotedNulls(), Yaml::isNull(quoted)) << word;
    if (!libraryTellsQuotedNulls()) continue;
    EXPECT_EQ("!tag", Yaml::tagOf(quoted)) << word;
    EXPECT_EQ(word, Yaml::scalarText(quoted));
  }
}

TEST(YamlNode, OtherTextsUnderATagAreNotNull) {
  for (const char *text : {"!tag nul", "!tag nulls", "!tag NuLL", "!tag ~~", "!tag ''"}) {
    EXPECT_FALSE(Yaml::isNull(yaml(text))) << text;
    EXPECT_EQ("!tag", Yaml::tagOf(yaml(text))) << text;
  }
}

TEST(YamlNode, ScalarTextIsReadWhateverTheTag) {
  EXPECT_EQ("a b", Yaml::scalarText(yaml("a b")));
  EXPECT_EQ("", Yaml::scalarText(yaml("''")));
  EXPECT_EQ("a", Yaml::scalarText(yaml("!tag a")));
}

TEST(YamlNode, TextOfANodeWithoutOneIsABadConversion) {
  for (const char *text : {"[a]", "{a: b}", "~", "!tag null"}) {
    SCOPED_TRACE(text);
    expectError<BadString>([&] { Yaml::scalarText(yaml(text)); }, {1, 1}, "bad conversion");
  }
}

TEST(YamlNode, InvalidNodeNeverNamesAKey) {
  const YAML::Node mapping = yaml("{a: 1}");
  const auto missing = [&mapping] { Yaml::requireValid(mapping["secret"]); };
  expectError<YAML::InvalidNode>(missing, kNowhere, kInvalidNode);
  EXPECT_NO_THROW(Yaml::requireValid(yaml("~")));
  expectError<YAML::InvalidNode>([] { Yaml::requireValid(invalidNode()); }, kNowhere, kInvalidNode);
  expectError<YAML::InvalidNode>([] { Yaml::scalarText(invalidNode()); }, kNowhere, kInvalidNode);
  expectError<YAML::InvalidNode>([] { Yaml::throwInvalidNode(); }, kNowhere, kInvalidNode);
}

}  // namespace
