// SPDX-License-Identifier: Apache-2.0
// What a plain or tagged YAML value comes to as a number and as a flag.
#include "calc/tagged_value.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <string>

#include "fake_store.h"
#include "yaml_support.h"

namespace {

using BadFloat = YAML::TypedBadConversion<float>;
using BadBool = YAML::TypedBadConversion<bool>;

constexpr float kInfinity = std::numeric_limits<float>::infinity();

const Calc::VariableTable kFacts = {{"numPCPUs", 12.0f}, {"isVm", 0.0f}, {"nan", NAN}};

float number(const std::string &text) {
  return NodeToFloat(yaml(text), kFacts);
}

bool flag(const std::string &text) {
  return NodeToBool(yaml(text), kFacts);
}

template <typename Error>
void expectNoNumber(const std::string &text, const std::string &message) {
  SCOPED_TRACE(text);
  expectError<Error>([&] { number(text); }, {1, 1}, message);
}

template <typename Error>
void expectNoFlag(const std::string &text, const std::string &message) {
  SCOPED_TRACE(text);
  expectError<Error>([&] { flag(text); }, {1, 1}, message);
}

template <typename Error>
void expectNeither(const std::string &text, const std::string &message) {
  expectNoNumber<Error>(text, message);
  expectNoFlag<Error>(text, message);
}

// An untagged scalar of that very text, blanks at the ends included.
YAML::Node plain(const std::string &text) {
  YAML::Node node(text);
  node.SetTag("?");
  return node;
}

// ---- plain numbers

TEST(PlainNumber, IsReadInSinglePrecision) {
  EXPECT_EQ(4096.0f, number("4096"));
  EXPECT_EQ(1000.0f, number("1e3"));
  EXPECT_EQ(-0.5f, number("-0.5"));
  EXPECT_EQ(0.5f, number("+.5"));
  EXPECT_EQ(5.0f, number("5."));
  EXPECT_EQ(0.1f, number("0.1"));
  EXPECT_EQ(16777216.0f, number("16777217"));
}

TEST(PlainNumber, KeepsTheSignOfZero) {
  EXPECT_TRUE(std::signbit(number("-0")));
}

TEST(PlainNumber, LeadingZerosAreDecimal) {
  EXPECT_EQ(10.0f, number("0010"));
}

TEST(PlainNumber, InfinityHasNineSpellings) {
  for (const char *text : {".inf", ".Inf", ".INF", "+.inf", "+.Inf", "+.INF"}) {
    EXPECT_EQ(kInfinity, number(text)) << text;
  }
  for (const char *text : {"-.inf", "-.Inf", "-.INF"}) EXPECT_EQ(-kInfinity, number(text)) << text;
}

TEST(PlainNumber, NotANumberHasThreeSpellings) {
  for (const char *text : {".nan", ".NaN", ".NAN"}) EXPECT_TRUE(std::isnan(number(text))) << text;
}

TEST(PlainNumber, OtherSpellingsAreABadConversion) {
  for (const char *text : {"12 MB", "0x10", "inf",   "nan", "-inf",  ".iNF",  "+.nan",
                           "-.nan", ".nAn", "1e",    "1,5", "1_000", "five",  "numPCPUs",
                           "--1",   "+-1",  "1.2.3", "-x",  "1e39",  "-1e39", "true"}) {
    expectNoNumber<BadFloat>(text, "bad conversion");
  }
}

TEST(PlainNumber, MayBeFollowedButNotPrecededByBlanks) {
  EXPECT_EQ(5.0f, NodeToFloat(plain("5 \t\n"), kFacts));
  EXPECT_THROW(NodeToFloat(plain(" 5"), kFacts), BadFloat);
  EXPECT_THROW(NodeToFloat(plain("5 5"), kFacts), BadFloat);
  EXPECT_THROW(NodeToFloat(plain(".inf "), kFacts), BadFloat);
  EXPECT_THROW(NodeToFloat(plain(""), kFacts), BadFloat);
}

TEST(PlainNumber, BadConversionIsReportedAtTheValue) {
  const YAML::Node document = yaml("a: 1\nbb:   12 MB\n");
  expectError<BadFloat>([&] { NodeToFloat(document["bb"], kFacts); }, {2, 7}, "bad conversion");
}

// ---- plain flags

TEST(PlainFlag, ReadsTheYamlLibrarysWords) {
  for (const char *text :
       {"y", "Y", "yes", "Yes", "YES", "true", "True", "TRUE", "on", "On", "ON"}) {
    EXPECT_TRUE(flag(text)) << text;
  }
  for (const char *text :
       {"n", "N", "no", "No", "NO", "false", "False", "FALSE", "off", "Off", "OFF"}) {
    EXPECT_FALSE(flag(text)) << text;
  }
}

TEST(PlainFlag, OtherTextsAreABadConversion) {
  for (const char *text : {"1", "0", "maybe", "tRUE", "yeS", "truee", "t", "0.0", ".inf"}) {
    expectNoFlag<BadBool>(text, "bad conversion");
  }
}

TEST(PlainFlag, BadConversionIsReportedAtTheValue) {
  const YAML::Node document = yaml("a: 1\nbb:   maybe\n");
  expectError<BadBool>([&] { NodeToBool(document["bb"], kFacts); }, {2, 7}, "bad conversion");
}

// ---- tags

TEST(Tag, CalcGivesTheExpressionsValue) {
  EXPECT_EQ(6.0f, number("!calc numPCPUs / 2"));
  EXPECT_EQ(6.0f, number("!calc {half: 2, =: numPCPUs / half}"));
}

TEST(Tag, CalcAsAFlagIsWhetherTheValueDiffersFromZero) {
  EXPECT_FALSE(flag("!calc isVm"));
  EXPECT_TRUE(flag("!calc not isVm"));
  EXPECT_TRUE(flag("!calc 0.5"));
  EXPECT_TRUE(flag("!calc -1"));
  EXPECT_TRUE(flag("!calc nan"));
  EXPECT_FALSE(flag("!calc 1 / (-1 / 0)"));
  EXPECT_FALSE(flag("!calc {a: 2, =: a - 2}"));
}

TEST(Tag, ConfigReadsTheStoreForNumbersAndFlags) {
  FakeStore::instance().reset();
  FakeStore::instance().objects["k/c/g/"] = {{"size", 7L}};
  EXPECT_EQ(7.0f, number("!config {object: [c, g, k], key: size, default: 1}"));
  EXPECT_TRUE(flag("!config {object: [c, g, k], key: size, default: no}"));
}

TEST(Tag, AnyOtherIsRefusedWithItsText) {
  expectNeither<Loader::Exception>("!math 3", "Unexpected tag !math");
  expectNeither<Loader::Exception>("!Calc 3", "Unexpected tag !Calc");
  expectNeither<Loader::Exception>("!calculate 3", "Unexpected tag !calculate");
  expectNeither<Loader::Exception>("!cal 3", "Unexpected tag !cal");
  expectNeither<Loader::Exception>("!CONFIG {a: 1}", "Unexpected tag !CONFIG");
  const std::string reference = "{object: [c, g, k], key: size, default: yes}";
  expectNeither<Loader::Exception>("!configX " + reference, "Unexpected tag !configX");
  expectNeither<Loader::Exception>("!confi " + reference, "Unexpected tag !confi");
  expectNeither<Loader::Exception>("!math [3]", "Unexpected tag !math");
}

TEST(Tag, StandardTagsAreRefusedInFull) {
  expectNeither<Loader::Exception>("!!float 3", "Unexpected tag tag:yaml.org,2002:float");
  expectNeither<Loader::Exception>("!!bool yes", "Unexpected tag tag:yaml.org,2002:bool");
}

TEST(Tag, VerbatimSpellingIsTheSameTag) {
  EXPECT_EQ(3.0f, number("!<!calc> 3"));
}

TEST(Tag, QuotedScalarIsRefused) {
  expectNeither<Loader::Exception>("\"5\"", "Unexpected tag !");
  expectNeither<Loader::Exception>("'yes'", "Unexpected tag !");
  expectNeither<Loader::Exception>("''", "Unexpected tag !");
  expectNeither<Loader::Exception>("|\n  5\n", "Unexpected tag !");
}

TEST(Tag, RefusalIsReportedAtTheValue) {
  const YAML::Node document = yaml("a: 1\nb: !math 3\nc: \"5\"\n");
  expectError<Loader::Exception>([&] { NodeToFloat(document["b"], kFacts); }, {2, 4},
                                 "Unexpected tag !math");
  expectError<Loader::Exception>([&] { NodeToBool(document["c"], kFacts); }, {3, 4},
                                 "Unexpected tag !");
}

// ---- values that are no scalars

TEST(Value, UntaggedMappingOrSequenceIsRefused) {
  for (const char *text : {"{a: 1}", "[1]", "{}", "[]"}) {
    expectNeither<Loader::Exception>(text, "Node is not a scalar.");
  }
}

TEST(Value, NullHasAnEmptyTag) {
  for (const char *word : {"~", "null", "Null", "NULL"}) {
    expectNeither<Loader::Exception>(word, "Unexpected tag ");
  }
}

TEST(Value, NullWordUnderATagIsAnUntaggedNull) {
  for (const char *text : {"!calc ~", "!config null", "!config ~", "!calc NULL", "!math ~"}) {
    expectNeither<Loader::Exception>(text, "Unexpected tag ");
  }
}

// Up to release 0.6 the yaml library tells a quoted null word from a plain one; later ones do not.
TEST(Value, QuotedNullWordUnderATagIsATextWhereTheLibraryTells) {
  const bool tells = yaml("!tag ~").IsNull();
  const std::string text = "unexpected symbol: null at 'null'";
  expectNeither<Loader::Exception>("!calc 'null'", tells ? text : "Unexpected tag ");
  expectNeither<Loader::Exception>("!math 'null'",
                                   tells ? "Unexpected tag !math" : "Unexpected tag ");
}

TEST(Value, ThatIsMissingIsAnUntaggedNull) {
  const YAML::Node document = yaml("a:\nb: 1\n");
  expectErrorAnywhere<Loader::Exception>([&] { NodeToFloat(document["a"], kFacts); },
                                         "Unexpected tag ");
  expectErrorAnywhere<Loader::Exception>([&] { NodeToBool(document["a"], kFacts); },
                                         "Unexpected tag ");
}

TEST(Value, ThatIsInvalidIsTheLibrarysPlainError) {
  expectError<YAML::InvalidNode>([] { NodeToFloat(invalidNode(), kFacts); }, kNowhere,
                                 kInvalidNode);
  expectError<YAML::InvalidNode>([] { NodeToBool(invalidNode(), kFacts); }, kNowhere, kInvalidNode);
}

TEST(Value, InvalidNodeOfAKeyNeverNamesIt) {
  const YAML::Node document = yaml("{a: 1}");
  expectError<YAML::InvalidNode>([&] { NodeToFloat(document["secret"], kFacts); }, kNowhere,
                                 kInvalidNode);
}

TEST(Value, AliasIsTheValueThatItNames) {
  const YAML::Node document = yaml("a: &x !calc numPCPUs\nb: *x\n");
  EXPECT_EQ(12.0f, NodeToFloat(document["b"], kFacts));
}

TEST(Value, FaultsInsideATagPassUnchanged) {
  expectNeither<Loader::Exception>("!calc foo", "unexpected symbol: foo at 'foo'");
  expectNeither<Loader::Exception>("!calc [1]", "expected scalar or mapping");
  expectNeither<Loader::Exception>("!config 5", "invalid config specification");
}

}  // namespace
