// SPDX-License-Identifier: Apache-2.0
// No text makes the evaluator hang or overflow its stack: nesting has a bound, and what stays
// below the bound evaluates within a modest stack.
#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "calc/evaluator.h"
#include "small_stack.h"

namespace {

constexpr std::size_t kMiB = 1024 * 1024;
constexpr std::size_t kStackBytes = EVALUATION_STACK_MIB * kMiB;

// One kind of nesting: `open` over and over, the innermost text, `close` as often.
struct Nesting {
  const char *name;
  const char *open;
  const char *inner;
  const char *close;
};

const Nesting kNestings[] = {
    {"Parentheses", "(", "1", ")"},
    {"ParenthesesAndBlanks", "( ", "1", " )"},
    {"ParenthesesInSums", "1+(", "1", ")"},
    {"ParenthesesInProducts", "1*(", "1", ")"},
    {"ParenthesesAfterIf", "1 if (", "1", ")"},
    {"Not", "not ", "1", ""},
    {"NotAndParentheses", "not(", "1", ")"},
    {"Sum", "1+", "1", ""},
    {"Difference", "1-", "1", ""},
    {"SumOfProducts", "1*1+", "1", ""},
    {"FirstArgumentOfMin", "min(", "1", ",1)"},
    {"SecondArgumentOfMax", "max(1,", "1", ")"},
    {"Ceil", "ceil(", "1", ")"},
    {"And", "1 and ", "1", ""},
    {"Or", "1 or ", "1", ""},
    {"If", "1 if ", "1", ""},
    {"IfElse", "1 if 1 else ", "1", ""},
    {"AndInTheTailOfAnd", "1 and 1*", "1", ""},
    {"OrInTheTailOfOr", "0 or 1/", "1", ""},
    {"IfInTheTailOfIf", "1 if 1*", "1", ""},
    {"IfInTheTailOfElse", "1 if 0 else 1*", "1", ""},
    {"NotInAProduct", "1*not ", "1", ""},
    {"IfElseInTheCondition", "1 if ", "1", " else 1"},
    {"EveryKind", "1-(min(ceil(not 1 and 1 or 1 if 1 else ", "1", "),1))"},
};

std::ostream &operator<<(std::ostream &out, const Nesting &nesting) {
  return out << nesting.name;
}

std::string nested(const Nesting &nesting, int levels) {
  std::string text;
  for (int i = 0; i < levels; ++i) text += nesting.open;
  text += nesting.inner;
  for (int i = 0; i < levels; ++i) text += nesting.close;
  return text;
}

// Where nested(nesting, levels) is refused, as an offset.
std::size_t expectTooDeep(const std::string &text) {
  try {
    const float value = Calc::Evaluate(text, {});
    ADD_FAILURE() << "gave " << value;
  } catch (const Calc::Exception &error) {
    EXPECT_STREQ("expression nested too deeply", error.what());
    return text.size() - std::strlen(error.position);
  }
  return 0;
}

class NestingKind : public testing::TestWithParam<Nesting> {};

TEST_P(NestingKind, EndsWithAFaultAtAMillionLevels) {
  const std::string text = nested(GetParam(), 1000000);
  runOnStackOf(8 * kMiB, [&] {
    const std::size_t place = expectTooDeep(text);
    EXPECT_GT(place, 0u);
    EXPECT_LT(place, 5100 * std::strlen(GetParam().open)) << "read on far beyond the bound";
  });
}

TEST_P(NestingKind, EndsWithAFaultAtAMillionLevelsOfATextThatBreaksOff) {
  std::string text;
  for (int i = 0; i < 1000000; ++i) text += GetParam().open;
  runOnStackOf(8 * kMiB, [&] { expectTooDeep(text); });
}

TEST_P(NestingKind, IsRefusedBeyondFiveThousandLevels) {
  const std::string text = nested(GetParam(), 5001);
  runOnStackOf(8 * kMiB, [&] { expectTooDeep(text); });
}

TEST_P(NestingKind, EvaluatesBelowTheBoundOnItsShareOfTheStack) {
  // "EveryKind" holds eight levels in each repetition.
  const int levels = std::string(GetParam().name) == "EveryKind" ? 400 : 2000;
  const std::string text = nested(GetParam(), levels);
  runOnStackOf(kStackBytes,
               [&] { EXPECT_NO_THROW(Calc::Evaluate(text, {})) << "at " << levels << " levels"; });
}

INSTANTIATE_TEST_SUITE_P(Bounds, NestingKind, testing::ValuesIn(kNestings),
                         [](const auto &one) { return std::string(one.param.name); });

// The outermost expression is a level too.
TEST(Bounds, FiveThousandLevelsAreTheMost) {
  const auto parentheses = [](std::size_t count) {
    return std::string(count, '(') + "7" + std::string(count, ')');
  };
  runOnStackOf(64 * kMiB, [&] {
    EXPECT_NO_THROW(EXPECT_EQ(7.0f, Calc::Evaluate(parentheses(4999), {})));
    EXPECT_EQ(5000u, expectTooDeep(parentheses(5000)));
  });
}

TEST(Bounds, ASumOfFourThousandTermsEvaluates) {
  std::string text = "1";
  for (int i = 1; i < 4000; ++i) text += " + 1";
  runOnStackOf(kStackBytes, [&] { EXPECT_EQ(4000.0f, Calc::Evaluate(text, {})); });
}

TEST(Bounds, ADifferenceOfFourThousandTermsEvaluates) {
  std::string text = "1";
  for (int i = 1; i < 4000; ++i) text += " - 1";
  runOnStackOf(kStackBytes, [&] { EXPECT_EQ(0.0f, Calc::Evaluate(text, {})); });
}

TEST(Bounds, FourThousandNestedParenthesesEvaluate) {
  const std::string text = std::string(4000, '(') + "7" + std::string(4000, ')');
  runOnStackOf(kStackBytes, [&] { EXPECT_EQ(7.0f, Calc::Evaluate(text, {})); });
}

TEST(Bounds, AProductOfAMillionFactorsIsNotNested) {
  std::string text = "3";
  for (int i = 0; i < 500000; ++i) text += "*2/2";
  runOnStackOf(kStackBytes, [&] { EXPECT_EQ(3.0f, Calc::Evaluate(text, {})); });
}

TEST(Bounds, TenThousandParenthesesSideBySideAreNotNested) {
  std::string text = "(1)";
  for (int i = 0; i < 10000; ++i) text += "*(1)*min(1,2)*ceil(1)";
  EXPECT_EQ(1.0f, Calc::Evaluate(text, {}));
}

TEST(Bounds, AMillionBlanksAreNotNested) {
  EXPECT_EQ(3.0f, Calc::Evaluate("1" + std::string(1000000, ' ') + "+ 2", {}));
}

TEST(Bounds, ANameOfAMillionLettersIsReportedWhole) {
  const std::string name(1000000, 'a');
  try {
    Calc::Evaluate(name, {});
    FAIL() << "an unknown name has no value";
  } catch (const Calc::Exception &error) {
    EXPECT_EQ("unexpected symbol: " + name, error.what());
  }
}

}  // namespace
