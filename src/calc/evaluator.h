// SPDX-License-Identifier: Apache-2.0
// The expression language of pool definitions: computes a number from a text and a table of
// variables.
#pragma once

#include <stdexcept>
#include <string>

#include "calc/variable_table.h"

namespace Calc {

// A fault in an expression. position points into the evaluated text and is valid as long as that
// text is.
class Exception : public std::runtime_error {
 public:
  Exception(const std::string &message, const char *where)
      : std::runtime_error(message), position(where) {}

  const char *position;
};

// Evaluates a text, which ends at its first NUL, in single precision. Division by zero gives an
// infinity or NaN. Throws Calc::Exception for a fault, and for a text nested more than 5,000 levels
// deep.
float Evaluate(const char *text, const VariableTable &variables);
float Evaluate(const std::string &text, const VariableTable &variables);

}  // namespace Calc
