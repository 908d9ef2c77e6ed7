// SPDX-License-Identifier: Apache-2.0
// The value of a node tagged "!calc": one expression, or a mapping of local definitions that ends
// with the expression.
#pragma once

#include <yaml-cpp/yaml.h>

#include "calc/variable_table.h"

namespace Calc {

// The node's tag is not looked at. Throws Loader::Exception at the node at fault, and what the
// conversion of a local definition throws.
float EvaluateNode(const YAML::Node &node, const VariableTable &variables);

}  // namespace Calc
