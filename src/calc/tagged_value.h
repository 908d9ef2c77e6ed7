// SPDX-License-Identifier: Apache-2.0
// Converts every value of a pool definition, plain, "!calc" or "!config", to a number or a truth
// value.
#pragma once

#include <yaml-cpp/yaml.h>

#include "calc/variable_table.h"

// Throw Loader::Exception with the node's place, the yaml library's conversion errors, and any
// exception from the evaluation of the tag. Bounded: at most 500 values, one inside the other, and
// 100,000 in all.
float NodeToFloat(const YAML::Node &node, const Calc::VariableTable &variables);
bool NodeToBool(const YAML::Node &node, const Calc::VariableTable &variables);
