// SPDX-License-Identifier: Apache-2.0
// Values tagged "!calc": the scalar form, the mapping form, and how faults get their place.
#include "calc/node_evaluator.h"

#include <gtest/gtest.h>

#include <cmath>
#include <string>

#include "yaml_support.h"

namespace {

using BadString = YAML::TypedBadConversion<std::string>;

const Calc::VariableTable kFacts = {{"numPCPUs", 8.0f}, {"physKB", 16384.0f}};

float evaluated(const std::string &text) {
  return Calc::EvaluateNode(yaml(text), kFacts);
}

template <typename Error>
void expectRefused(const std::string &text, Place place, const std::string &message) {
  expectError<Error>([&] { evaluated(text); }, place, message);
}

// ---- the scalar form

TEST(CalcScalar, GivesTheValueOfItsExpression) {
  EXPECT_EQ(16.0f, evaluated("!calc numPCPUs * 2"));
  EXPECT_EQ(5.0f, evaluated("!calc 10 - 2 + 3"));
}

TEST(CalcScalar, IsReadTheSameInQuotesAndInBlocks) {
  EXPECT_EQ(16.0f, evaluated("!calc 'numPCPUs * 2'"));
  EXPECT_EQ(16.0f, evaluated("!calc \"numPCPUs * 2\""));
  EXPECT_EQ(16.0f, evaluated("!calc >\n  numPCPUs\n  * 2\n"));
  EXPECT_EQ(16.0f, evaluated("!calc |\n  numPCPUs\n  * 2\n"));
}

TEST(CalcScalar, ItsTagIsNotLookedAt) {
  EXPECT_EQ(16.0f, evaluated("numPCPUs * 2"));
  EXPECT_EQ(16.0f, evaluated("!math numPCPUs * 2"));
  EXPECT_EQ(16.0f, evaluated("'numPCPUs * 2'"));
}

TEST(CalcScalar, UnknownNameIsReportedWithTheRestOfTheText) {
  expectRefused<Loader::Exception>("!calc foo + 1", {1, 1}, "unexpected symbol: foo at 'foo + 1'");
}

TEST(CalcScalar, FaultAtTheEndIsReportedWithNoRest) {
  expectRefused<Loader::Exception>("!calc 2 +", {1, 1}, "Missing numeric value. at ''");
}

TEST(CalcScalar, FaultInTheMiddleIsReportedFromThereOn) {
  expectRefused<Loader::Exception>("!calc min(1 2)", {1, 1}, "min expected , at '2)'");
  expectRefused<Loader::Exception>("!calc 12 MB", {1, 1}, "unexpected char at 'MB'");
}

TEST(CalcScalar, FaultIsReportedAtTheNode) {
  const YAML::Node document = yaml("a: 1\nb: !calc foo\n");
  expectError<Loader::Exception>([&] { Calc::EvaluateNode(document["b"], kFacts); }, {2, 4},
                                 "unexpected symbol: foo at 'foo'");
}

TEST(CalcScalar, FaultReadsAsTheYamlLibraryWritesErrors) {
  try {
    evaluated("!calc foo + 1");
    FAIL() << "an unknown name has no value";
  } catch (const YAML::RepresentationException &error) {
    EXPECT_STREQ("yaml-cpp: error at line 1, column 1: unexpected symbol: foo at 'foo + 1'",
                 error.what());
  }
}

TEST(CalcScalar, EmptyTextIsAMissingNumber) {
  expectRefused<Loader::Exception>("!calc ''", {1, 1}, "Missing numeric value. at ''");
  const YAML::Node document = yaml("a: !calc\nb: 1\n");
  expectError<Loader::Exception>([&] { Calc::EvaluateNode(document["a"], kFacts); }, {1, 4},
                                 "Missing numeric value. at ''");
}

TEST(CalcScalar, ExpressionThatWouldNeverEndIsReportedAtTheNode) {
  expectRefused<Loader::Exception>(
      "!calc 1 + True", {1, 1},
      "expression never ends: True or False after an operator at '+ True'");
}

TEST(CalcScalar, EndsAtAZeroByte) {
  EXPECT_EQ(1.0f, evaluated("!calc \"1\\0 + 1\""));
}

// ---- the mapping form

TEST(CalcMapping, DefinitionsServeTheResult) {
  EXPECT_EQ(4096.0f, evaluated("!calc\nhalf: !calc physKB / 2\ncap: 4096\n=: min(half, cap)\n"));
  EXPECT_EQ(6.0f, evaluated("!calc {a: 2, =: a * 3}"));
}

TEST(CalcMapping, ResultSeesTheHostFacts) {
  EXPECT_EQ(9.0f, evaluated("!calc {a: 1, =: a + numPCPUs}"));
}

TEST(CalcMapping, DefinitionsDoNotSeeOneAnother) {
  expectRefused<Loader::Exception>("!calc\na: 2\nb: !calc a * 3\n=: b\n", {3, 4},
                                   "unexpected symbol: a at 'a * 3'");
}

TEST(CalcMapping, DefinitionsDoNotSeeAnOverriddenFact) {
  EXPECT_EQ(12.0f, evaluated("!calc {numPCPUs: 4, n: !calc numPCPUs, =: n + numPCPUs}"));
}

TEST(CalcMapping, UntaggedDefinitionIsAPlainNumber) {
  expectRefused<YAML::TypedBadConversion<float>>("!calc\nb: numPCPUs * 2\n=: b\n", {2, 4},
                                                 "bad conversion");
}

TEST(CalcMapping, DefinitionOverridesAHostFactForTheResult) {
  EXPECT_EQ(4.0f, evaluated("!calc {numPCPUs: 4, =: numPCPUs}"));
}

TEST(CalcMapping, LeavesTheCallersTableAlone) {
  const Calc::VariableTable before = kFacts;
  evaluated("!calc {numPCPUs: 4, other: 5, =: numPCPUs + other}");
  EXPECT_EQ(before, kFacts);
  EXPECT_EQ(8.0f, evaluated("!calc numPCPUs"));
}

TEST(CalcMapping, LaterDefinitionOfANameWins) {
  EXPECT_EQ(3.0f, evaluated("!calc {a: 2, a: 3, =: a}"));
}

TEST(CalcMapping, DefinitionMayBearAWordOfTheLanguage) {
  EXPECT_EQ(2.0f, evaluated("!calc {True: 2, =: True}"));
  EXPECT_EQ(7.0f, evaluated("!calc {min: 7, =: min}"));
}

TEST(CalcMapping, DefinitionMayBeAMappingItself) {
  EXPECT_EQ(25.0f, evaluated("!calc {a: !calc {b: 5, =: b * b}, =: a}"));
}

TEST(CalcMapping, LocalNamesOfAnInnerMappingStayInside) {
  expectRefused<Loader::Exception>("!calc\na: !calc {b: 5, =: b}\n=: b\n", {3, 4},
                                   "unexpected symbol: b");
}

TEST(CalcMapping, ResultEntryThatIsNotLastIsIgnored) {
  EXPECT_EQ(2.0f, evaluated("!calc {=: a * 3, a: 2}"));
  EXPECT_EQ(2.0f, evaluated("!calc {=: '(((', a: 2}"));
  EXPECT_EQ(2.0f, evaluated("!calc {=: [], a: 2}"));
}

TEST(CalcMapping, LoneDefinitionIsTheResult) {
  EXPECT_EQ(2.0f, evaluated("!calc {a: 2}"));
}

TEST(CalcMapping, FinalDefinitionIsDefinedAndThenReadAsTheResultsText) {
  EXPECT_EQ(16.0f, evaluated("!calc {=: 1, x: !calc numPCPUs * 2}"));
  EXPECT_EQ(9.0f, evaluated("!calc {x: 1, x: !calc numPCPUs + 1}"));
  // The definition comes to 8, and its own text is then read with it in place.
  EXPECT_EQ(64.0f, evaluated("!calc {numPCPUs: !calc numPCPUs * 8}") / 8.0f);
}

TEST(CalcMapping, FinalDefinitionMustConvertAsOne) {
  expectRefused<YAML::TypedBadConversion<float>>("!calc\na: 1\nb: a + 1\n", {3, 4},
                                                 "bad conversion");
}

TEST(CalcMapping, TwoResultEntriesGiveTheLast) {
  EXPECT_EQ(2.0f, evaluated("!calc {=: 1, =: 2}"));
}

TEST(CalcMapping, TagOfTheResultIsNotLookedAt) {
  EXPECT_EQ(16.0f, evaluated("!calc {=: !math numPCPUs * 2}"));
  EXPECT_EQ(16.0f, evaluated("!calc {=: 'numPCPUs * 2'}"));
  EXPECT_EQ(16.0f, evaluated("!calc {=: !config numPCPUs * 2}"));
}

TEST(CalcMapping, FaultInTheResultIsItsMessageAloneAtTheResult) {
  expectRefused<Loader::Exception>("!calc\na: 2\n=: foo + a\n", {3, 4}, "unexpected symbol: foo");
  expectRefused<Loader::Exception>("!calc {a: 2, =: a b}", {1, 17}, "unexpected char");
}

TEST(CalcMapping, FaultInADefinitionIsReportedWithTheRestAtTheDefinition) {
  expectRefused<Loader::Exception>("!calc\na: !calc 1 +\n=: a\n", {2, 4},
                                   "Missing numeric value. at ''");
}

TEST(CalcMapping, ResultWithoutAValueIsABadConversion) {
  expectErrorAnywhere<BadString>([] { evaluated("!calc\na: 2\n=:\n"); }, "bad conversion");
  expectRefused<BadString>("!calc\na: 2\n=: ~\n", {3, 4}, "bad conversion");
  expectRefused<BadString>("!calc\na: 2\n=: !calc null\n", {3, 4}, "bad conversion");
}

TEST(CalcMapping, ResultThatIsNoScalarIsABadConversionAtTheResult) {
  expectRefused<BadString>("!calc\n=: [1]\n", {2, 4}, "bad conversion");
  expectRefused<BadString>("!calc\n=: {a: 1}\n", {2, 4}, "bad conversion");
}

TEST(CalcMapping, FinalDefinitionThatIsNoScalarIsABadConversion) {
  expectRefused<BadString>("!calc\na: !calc {=: 1}\n", {2, 4}, "bad conversion");
}

TEST(CalcMapping, KeyThatIsNoScalarIsABadConversionAtTheKey) {
  expectRefused<BadString>("!calc\n? [a]\n: 1\n", {2, 3}, "bad conversion");
  expectRefused<BadString>("!calc\n? {a: 1}\n: 1\n", {2, 3}, "bad conversion");
  expectRefused<BadString>("!calc\n~: 1\n", {2, 1}, "bad conversion");
}

TEST(CalcMapping, DefinitionWithoutAValueIsAnUnexpectedTag) {
  expectRefused<Loader::Exception>("!calc {a: ~, =: 1}", {1, 11}, "Unexpected tag ");
}

TEST(CalcMapping, WithoutEntriesIsAnInvalidNode) {
  expectRefused<YAML::InvalidNode>("!calc {}", kNowhere, kInvalidNode);
}

TEST(CalcMapping, HoldsAsManyDefinitionsAsOneLikes) {
  std::string text = "!calc\n";
  for (int i = 0; i < 10000; ++i) text += "v" + std::to_string(i) + ": " + std::to_string(i) + "\n";
  EXPECT_EQ(10007.0f, evaluated(text + "=: v9999 + numPCPUs\n"));
}

// ---- other nodes

TEST(CalcNode, ThatIsNeitherScalarNorMappingIsRefusedAtTheNode) {
  const std::string message = "expected scalar or mapping";
  expectRefused<Loader::Exception>("!calc [1, 2]", {1, 1}, message);
  expectRefused<Loader::Exception>("!calc []", {1, 1}, message);
  expectRefused<Loader::Exception>("~", {1, 1}, message);
  const YAML::Node document = yaml("a: 1\nb: !calc\n- 1\n");
  expectError<Loader::Exception>([&] { Calc::EvaluateNode(document["b"], kFacts); }, {2, 4},
                                 message);
}

TEST(CalcNode, ThatIsNotDefinedIsRefused) {
  expectErrorAnywhere<Loader::Exception>(
      [] { Calc::EvaluateNode(YAML::Node(YAML::NodeType::Undefined), kFacts); },
      "expected scalar or mapping");
}

TEST(CalcNode, NullWordUnderTheTagIsANull) {
  for (const char *word : {"~", "null", "Null", "NULL"}) {
    expectRefused<Loader::Exception>(std::string("!calc ") + word, {1, 1},
                                     "expected scalar or mapping");
  }
}

TEST(CalcNode, ThatIsInvalidIsTheLibrarysPlainError) {
  expectError<YAML::InvalidNode>([] { Calc::EvaluateNode(invalidNode(), kFacts); }, kNowhere,
                                 kInvalidNode);
}

}  // namespace
