// SPDX-License-Identifier: Apache-2.0
// The expression language of pool definitions: one text, a table of variables, one number.
#pragma once

#include <stdexcept>
#include <string>

#include "calc/variable_table.h"

namespace Calc {

// A fault in an expression. position points into the evaluated text, which must still be alive.
class Exception : public std::runtime_error {
 public:
  Exception(const std::string &message, const char *where)
      : std::runtime_error(message), position(where) {}

  const char *position;
};

// Evaluates a whole text, which ends at its first NUL, in single precision. Throws
// Calc::Exception.
float Evaluate(const char *text, const VariableTable &variables);
float Evaluate(const std::string &text, const VariableTable &variables);

}  // namespace Calc
