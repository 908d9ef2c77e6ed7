// SPDX-License-Identifier: Apache-2.0
// Values tagged "!config": a field of an object in the host's configuration store, or a default.
#pragma once

#include <yaml-cpp/yaml.h>

#include "calc/variable_table.h"

// The stored value, or the default if the store has no value or cannot be read. Throw
// Loader::Exception if the reference is malformed, the yaml library's errors, and any exception
// from the conversion of the default.
float ConfigToFloat(const YAML::Node &node, const Calc::VariableTable &facts);
bool ConfigToBool(const YAML::Node &node, const Calc::VariableTable &facts);
