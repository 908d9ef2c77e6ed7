// SPDX-License-Identifier: Apache-2.0
// Reads values from YAML nodes. Releases of the yaml library differ in which nodes are null and in
// some error texts; these functions give the same result with every release.
#pragma once

#include <yaml-cpp/yaml.h>

#include <string>

namespace Yaml {

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

}  // namespace Yaml
