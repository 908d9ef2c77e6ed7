// SPDX-License-Identifier: Apache-2.0
// What callers of Calc::Evaluate rely on besides the language: where positions point, what the
// exception is, and that the table is only read.
#include <gtest/gtest.h>

#include <cmath>
#include <string>
#include <type_traits>

#include "calc/evaluator.h"

namespace {

static_assert(std::is_base_of_v<std::runtime_error, Calc::Exception>);
static_assert(std::has_virtual_destructor_v<Calc::Exception>);
static_assert(std::is_same_v<const char *, decltype(Calc::Exception::position)>);

TEST(Evaluate, PositionPointsIntoTheTextThatWasGiven) {
  const char text[] = "1 + foo";
  try {
    Calc::Evaluate(text, {});
    FAIL() << "an unknown name has no value";
  } catch (const Calc::Exception &error) {
    EXPECT_EQ(text + 4, error.position);
  }
}

TEST(Evaluate, PositionPointsIntoTheStringThatWasGiven) {
  const std::string text = "min(1, 2";
  try {
    Calc::Evaluate(text, {});
    FAIL() << "a missing parenthesis is a fault";
  } catch (const Calc::Exception &error) {
    EXPECT_EQ(text.c_str() + text.size(), error.position);
  }
}

TEST(Evaluate, TextEndsAtItsFirstNul) {
  EXPECT_EQ(1.0f, Calc::Evaluate(std::string("1\0 + 2", 6), {}));
  EXPECT_THROW(Calc::Evaluate(std::string("\0"
                                          "1",
                                          2),
                              {}),
               Calc::Exception);
}

TEST(Evaluate, NamesAreMatchedByteForByte) {
  const Calc::VariableTable variables = {{"x", 1.0f}, {"X", 2.0f}, {"x.", 3.0f}, {"x_", 4.0f}};
  EXPECT_EQ(1.0f, Calc::Evaluate("x", variables));
  EXPECT_EQ(2.0f, Calc::Evaluate("X", variables));
  EXPECT_EQ(3.0f, Calc::Evaluate("x.", variables));
  EXPECT_EQ(4.0f, Calc::Evaluate("x_", variables));
}

TEST(Evaluate, NamesOutsideTheLanguageCannotBeReached) {
  const Calc::VariableTable variables = {{"=", 1.0f}, {"", 2.0f}, {"a b", 3.0f}, {"1a", 4.0f}};
  EXPECT_THROW(Calc::Evaluate("=", variables), Calc::Exception);
  EXPECT_THROW(Calc::Evaluate("", variables), Calc::Exception);
  EXPECT_THROW(Calc::Evaluate("a b", variables), Calc::Exception);
  EXPECT_THROW(Calc::Evaluate("1a", variables), Calc::Exception);
}

TEST(Evaluate, LongNamesAreLookedUpWhole) {
  const std::string name(300, 'n');
  const Calc::VariableTable variables = {{name, 5.0f}, {name.substr(0, 299), 6.0f}};
  EXPECT_EQ(5.0f, Calc::Evaluate(name, variables));
  EXPECT_THROW(Calc::Evaluate(name + "n", variables), Calc::Exception);
}

TEST(Evaluate, CeilingOfMinusOneHalfIsMinusZero) {
  EXPECT_EQ(0.0f, Calc::Evaluate("ceil(-0.5)", {}));
  EXPECT_TRUE(std::signbit(Calc::Evaluate("ceil(-0.5)", {})));
  EXPECT_EQ(-INFINITY, Calc::Evaluate("1 / ceil(-0.5)", {}));
}

TEST(Evaluate, TruthIsExactlyOneOrZero) {
  const Calc::VariableTable variables = {{"nan", NAN}, {"tiny", 1e-45f}};
  EXPECT_EQ(1.0f, Calc::Evaluate("5 and 7", variables));
  EXPECT_EQ(1.0f, Calc::Evaluate("0 or 7", variables));
  EXPECT_EQ(1.0f, Calc::Evaluate("nan and tiny", variables));
  EXPECT_EQ(0.0f, Calc::Evaluate("nan and 0", variables));
  EXPECT_EQ(0.0f, Calc::Evaluate("not tiny", variables));
}

TEST(Evaluate, LeavesTheTableAlone) {
  const Calc::VariableTable variables = {{"x", 1.0f}};
  const Calc::VariableTable before = variables;
  EXPECT_EQ(2.0f, Calc::Evaluate("x + x", variables));
  EXPECT_THROW(Calc::Evaluate("x + y", variables), Calc::Exception);
  EXPECT_EQ(before, variables);
}

TEST(Evaluate, KeepsNothingBetweenCalls) {
  EXPECT_THROW(Calc::Evaluate("1 + True", {}), Calc::Exception);
  EXPECT_EQ(3.0f, Calc::Evaluate("1 + 2", {}));
  EXPECT_THROW(Calc::Evaluate(std::string(100000, '('), {}), Calc::Exception);
  EXPECT_EQ(1.0f, Calc::Evaluate("((1))", {}));
}

}  // namespace
