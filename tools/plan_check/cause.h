// SPDX-License-Identifier: Apache-2.0
// Why a value is refused, in terms of what people mistype. The evaluator and the loader decide
// whether it is refused; the functions here only find out more about it.
#pragma once

#include <cstddef>
#include <optional>
#include <string>

#include "calc/variable_table.h"

namespace Plan {

struct Cause {
  std::string code;      // as in Finding
  std::string message;   // what is wrong
  std::string expected;  // may be empty
  std::string advice;    // may be empty
  size_t offset = 0;     // where in the text
};

// What a number counts. It decides what a unit behind the number means.
enum class Unit { kMemoryMB, kCpuPercent, kShares, kNone };

// Of an expression that Calc::Evaluate refuses with MESSAGE at OFFSET. The variables are those that
// the expression may use.
Cause expressionCause(const std::string &text, const std::string &message, size_t offset,
                      const Calc::VariableTable &variables);

// Of a plain scalar that is not a number.
Cause numberCause(const std::string &text, Unit unit, const Calc::VariableTable &variables);

// Of a plain scalar that is not a truth value.
Cause truthCause(const std::string &text, const Calc::VariableTable &variables);

// Of a tag that is not accepted. An empty tag is that of a null; "!" that of a quoted text.
Cause tagCause(const std::string &tag, const std::string &text);

}  // namespace Plan
