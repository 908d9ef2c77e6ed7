// SPDX-License-Identifier: Apache-2.0
// Finds expressions that most readers would group in another way than the language does.
#pragma once

#include <optional>
#include <string>

#include "calc/variable_table.h"
#include "plan_check/expression.h"

namespace Plan {

// How the text is grouped in most languages (minus to the left, arithmetic before "and", "and"
// before "or", "if" last), when that is another expression than READ; otherwise empty. READ: what
// readExpression() made of the text.
std::optional<Expression> usualReading(const std::string &text, const Expression &read,
                                       const Calc::VariableTable &variables);

}  // namespace Plan
