// SPDX-License-Identifier: Apache-2.0
// The one door from a pool's value to a number or a truth value: plain, "!calc" or "!config".
#pragma once

#include <yaml-cpp/yaml.h>

#include "calc/variable_table.h"

// Throw Loader::Exception at the node, the yaml library's conversion errors, and what the
// evaluation of the tag throws.
float NodeToFloat(const YAML::Node &node, const Calc::VariableTable &variables);
bool NodeToBool(const YAML::Node &node, const Calc::VariableTable &variables);
