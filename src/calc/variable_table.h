// SPDX-License-Identifier: Apache-2.0
// The variables that an expression may name.
#pragma once

#include <string>
#include <unordered_map>

namespace Calc {

// Names are matched byte for byte and may hold dots.
using VariableTable = std::unordered_map<std::string, float>;

}  // namespace Calc
