// SPDX-License-Identifier: Apache-2.0
// Runs every case of expressions.test as a test of its own, named by its line, against both
// readings of the language.
#include <gtest/gtest.h>

#include <cmath>
#include <stdexcept>

#include "calc/evaluator.h"
#include "expression_file.h"
#include "naive_evaluator.h"

namespace {

// A file that cannot be read becomes one case that says so.
std::vector<ExpressionCase> cases() {
  try {
    return readExpressionFile(EXPRESSION_CASES);
  } catch (const std::runtime_error &error) {
    ExpressionCase broken;
    broken.fails = true;
    broken.message = error.what();
    return {broken};
  }
}

void expectValue(float expected, float actual) {
  if (std::isnan(expected)) {
    EXPECT_TRUE(std::isnan(actual)) << "not NaN but " << actual;
  } else {
    EXPECT_EQ(expected, actual);
    EXPECT_EQ(std::signbit(expected), std::signbit(actual)) << "the zeros differ in their sign";
  }
}

class ExpressionFile : public testing::TestWithParam<ExpressionCase> {};

TEST_P(ExpressionFile, GivesTheWrittenAnswer) {
  const ExpressionCase &one = GetParam();
  try {
    const float value = Calc::Evaluate(one.expression.c_str(), one.variables);
    ASSERT_FALSE(one.fails) << "gave " << value << " instead of: " << one.message;
    expectValue(one.value, value);
  } catch (const Calc::Exception &error) {
    ASSERT_TRUE(one.fails) << error.what() << " at '" << error.position << "'";
    EXPECT_EQ(one.message, error.what());
    EXPECT_EQ(one.rest, error.position);
  }
}

TEST_P(ExpressionFile, GivesTheWrittenAnswerInThePlainReading) {
  const ExpressionCase &one = GetParam();
  const Naive::Outcome outcome = Naive::evaluate(one.expression, one.variables);
  ASSERT_EQ(one.fails, outcome.failed) << outcome.message;
  if (one.fails) {
    EXPECT_EQ(one.message, outcome.message);
    EXPECT_EQ(one.rest, one.expression.substr(outcome.position));
  } else {
    expectValue(one.value, outcome.value);
  }
}

INSTANTIATE_TEST_SUITE_P(Expressions, ExpressionFile, testing::ValuesIn(cases()),
                         [](const auto &one) { return "Line" + std::to_string(one.param.line); });

}  // namespace
