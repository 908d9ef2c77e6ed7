// SPDX-License-Identifier: Apache-2.0
// The second reader of expressions against the evaluator, and the brackets that it prints.
#include "plan_check/expression.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <limits>
#include <string>
#include <vector>

#include "calc/evaluator.h"
#include "plan_check/grouping.h"
#include "random_text.h"

namespace {

using Plan::bracketed;
using Plan::readExpression;

const Calc::VariableTable kFacts = {{"a", 10.0F}, {"b", 2.0F}, {"c", 3.0F}};

std::optional<float> evaluated(const std::string &text, const Calc::VariableTable &variables) {
  try {
    return Calc::Evaluate(text, variables);
  } catch (const Calc::Exception &) {
    return std::nullopt;
  }
}

bool same(float one, float other) {
  if (std::isnan(one) || std::isnan(other)) return std::isnan(one) && std::isnan(other);
  return std::memcmp(&one, &other, sizeof one) == 0;
}

// Both refuse the text, or both give the same value.
bool agree(const std::string &text, const Calc::VariableTable &variables) {
  const auto expected = evaluated(text, variables);
  const auto read = readExpression(text, variables);
  if (expected.has_value() != read.has_value()) return false;
  return !read || same(*expected, read->value);
}

std::string brackets(const std::string &text) {
  const auto read = readExpression(text, kFacts);
  return read ? bracketed(*read) : "refused";
}

std::string usual(const std::string &text) {
  const auto read = readExpression(text, kFacts);
  if (!read) return "refused";
  const auto other = Plan::usualReading(text, *read, kFacts);
  return other ? bracketed(*other) : "the same";
}

TEST(SecondReader, AgreesWithTheEvaluatorOnAMillionTexts) {
  constexpr float kNaN = std::numeric_limits<float>::quiet_NaN();
  const std::vector<Calc::VariableTable> tables = {
      {},
      {{"x", 3.0F}, {"y", -0.0F}, {"n", kNaN}, {"z", 0.0F}, {"a.b", 0.5F}},
      {{"min", 2.0F}, {"True", 1.0F}, {"foo", 1e38F}, {"x", -1.0F}}};
  RandomText random(20261121);
  int accepted = 0;
  for (int i = 0; i < 1000000; ++i) {
    const std::string text = random.next();
    const Calc::VariableTable &variables = tables[static_cast<size_t>(i) % tables.size()];
    ASSERT_TRUE(agree(text, variables)) << "'" << text << "'";
    accepted += evaluated(text, variables) ? 1 : 0;
  }
  EXPECT_GT(accepted, 100000);
}

// The text with all brackets is the same expression, for the evaluator too.
TEST(SecondReader, TheTextWithBracketsHasTheSameValue) {
  const Calc::VariableTable variables = {{"x", 3.0F}, {"y", -0.0F}, {"a.b", 0.5F}};
  RandomText random(7);
  for (int i = 0; i < 200000; ++i) {
    const std::string text = random.next();
    const auto read = readExpression(text, variables);
    if (!read) continue;
    const auto again = evaluated(bracketed(*read), variables);
    ASSERT_TRUE(again) << "'" << text << "' as '" << bracketed(*read) << "'";
    ASSERT_TRUE(same(*again, read->value)) << "'" << text << "' as '" << bracketed(*read) << "'";
  }
}

TEST(SecondReader, ShowsTheBracketsOfTheLanguage) {
  EXPECT_EQ(brackets("a - b - c"), "a - (b - c)");
  EXPECT_EQ(brackets("a / b / c"), "(a / b) / c");
  EXPECT_EQ(brackets("a and b + c"), "(a and b) + c");
  EXPECT_EQ(brackets("not a + 1"), "not (a + 1)");
  EXPECT_EQ(brackets("a if b else c + 1"), "(a if b else c) + 1");
  EXPECT_EQ(brackets("min( a,b )"), "min(a, b)");
}

TEST(Grouping, IsReportedWhereItDiffersFromOtherLanguages) {
  EXPECT_EQ(usual("a - b - c"), "(a - b) - c");
  EXPECT_EQ(usual("a - b + c"), "(a - b) + c");
  EXPECT_EQ(usual("a + b and c"), "(a + b) and c");
  EXPECT_EQ(usual("a and b or c"), "(a and b) or c");
  EXPECT_EQ(usual("a if b else c + 1"), "a if b else (c + 1)");
  EXPECT_EQ(usual("not a and b"), "(not a) and b");
}

TEST(Grouping, IsNotReportedWhereBothAreTheSame) {
  for (const char *const text :
       {"a + b + c", "a * b * c", "a / b / c", "a + b - c", "a - (b - c)", "(a - b) - c",
        "a and b and c", "not a", "not a + 1", "min(a - b, c)", "a if b else c", "-2 + a"}) {
    EXPECT_EQ(usual(text), "the same") << text;
  }
}

TEST(NumberText, ReadsBackAsTheSameValue) {
  for (const float value : {0.0F, 1.0F, -2.5F, 16777216.0F, 1e30F, 0.1F}) {
    EXPECT_EQ(std::strtof(Plan::numberText(value).c_str(), nullptr), value);
  }
  EXPECT_EQ(Plan::numberText(1280.0F), "1280");
}

}  // namespace
