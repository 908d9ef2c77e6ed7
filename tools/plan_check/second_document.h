// SPDX-License-Identifier: Apache-2.0
// What the loader does not read of a file: all that follows the first YAML document.
#pragma once

#include <yaml-cpp/mark.h>

#include <string>

namespace Plan {

// Where the second document begins, or where it cannot be read; the null mark when there is none,
// or an empty one. The first document must be readable.
YAML::Mark secondDocument(const std::string &text);

}  // namespace Plan
