// SPDX-License-Identifier: Apache-2.0
// Reads values from YAML nodes. Releases of the yaml library differ in which nodes are null and in
// some error texts; these functions give the same result with every release.
#pragma once

#include <yaml-cpp/yaml.h>

#include <string>

namespace Yaml {

// Throws the yaml library's invalid-node error with the text that does not name a key.
[[noreturn]] void throwInvalidNode();

// Throws the yaml library's error for a file that cannot be read.
[[noreturn]] void throwBadFile(const std::string &path);

// Throws the invalid-node error when the node is not valid.
void requireValid(const YAML::Node &node);

// Whether the node is null. A plain ~ or null after a tag is null too; a quoted one is not, where
// the yaml library tells them apart.
bool isNull(const YAML::Node &node);

// The node's tag; empty for a null.
std::string tagOf(const YAML::Node &node);

// The text of a scalar. Throws YAML::TypedBadConversion<std::string> with the node's place for any
// other node, a null included.
std::string scalarText(const YAML::Node &node);

}  // namespace Yaml
