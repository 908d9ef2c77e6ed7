// SPDX-License-Identifier: Apache-2.0
// The value of a node tagged "!calc": an expression, or a mapping of local definitions whose last
// entry is the expression.
#pragma once

#include <yaml-cpp/yaml.h>

#include "calc/variable_table.h"

namespace Calc {

// Ignores the node's tag. Throws Loader::Exception with the place of the fault, the yaml library's
// conversion errors, and any exception from the conversion of a local definition.
float EvaluateNode(const YAML::Node &node, const VariableTable &variables);

}  // namespace Calc
