// SPDX-License-Identifier: Apache-2.0
// The variables that an expression can use.
#pragma once

#include <string>
#include <unordered_map>

namespace Calc {

// Names are compared byte for byte and may contain dots.
using VariableTable = std::unordered_map<std::string, float>;

}  // namespace Calc
