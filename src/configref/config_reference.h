// SPDX-License-Identifier: Apache-2.0
// Values tagged "!config": a field of an object in the host's configuration store, or a default.
#pragma once

#include <yaml-cpp/yaml.h>

#include "calc/variable_table.h"

// The stored value, or the default when the store has none or cannot be asked. Throw
// Loader::Exception when the reference is malformed, and what the default's conversion throws.
float ConfigToFloat(const YAML::Node &node, const Calc::VariableTable &facts);
bool ConfigToBool(const YAML::Node &node, const Calc::VariableTable &facts);
