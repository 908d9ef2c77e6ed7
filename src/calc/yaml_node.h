// SPDX-License-Identifier: Apache-2.0
// How values are taken out of YAML nodes. The yaml library's releases differ in what they call a
// null and in some of their texts; here every release gives the same answer.
#pragma once

#include <yaml-cpp/yaml.h>

#include <string>

namespace Calc {

// Throws the yaml library's plain invalid-node error, which never names a key.
[[noreturn]] void throwInvalidNode();

// Throws that error when the node is not valid.
void requireValid(const YAML::Node &node);

// Whether the node is a null. A plain ~ or null under a tag is one.
bool isNull(const YAML::Node &node);

// The node's tag; empty for a null.
std::string tagOf(const YAML::Node &node);

// The text of a scalar. Throws YAML::TypedBadConversion<std::string> at the node's mark when it is
// not a scalar; a null has no text.
std::string scalarText(const YAML::Node &node);

}  // namespace Calc
