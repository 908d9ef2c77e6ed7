// SPDX-License-Identifier: Apache-2.0
// A second reader of the expression language. It keeps what it has read as a tree, for everything
// that explains an expression. The evaluator of src/calc decides what an expression is worth; a
// test compares both.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "calc/variable_table.h"

namespace Plan {

struct Expression {
  enum class Kind {
    kNumber,
    kVariable,
    kMin,   // parts: both arguments
    kMax,   // parts: both arguments
    kCeil,  // parts: the argument
    kNot,   // parts: the operand
    kAdd,   // parts: left and right, as for the four below
    kSubtract,
    kMultiply,
    kDivide,
    kAnd,
    kOr,
    kIf,  // parts: value, condition and, unless it is missing, alternative
  };

  Kind kind = Kind::kNumber;
  std::string text;  // of a number or a variable, as written
  float value = 0;
  std::vector<Expression> parts;
};

// The tree of a text that ends at its first NUL, with the value of each part. Empty exactly where
// Calc::Evaluate throws; but that function bounds the nesting and this one does not, so give it
// only texts that Calc::Evaluate has accepted.
std::optional<Expression> readExpression(const std::string &text,
                                         const Calc::VariableTable &variables);

// The expression with the brackets that the language sets: "a - (b - c)" for "a - b - c".
std::string bracketed(const Expression &expression);

// A number of the expression language in the shortest form that reads back as the same value.
std::string numberText(float value);

}  // namespace Plan
