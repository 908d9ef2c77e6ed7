// SPDX-License-Identifier: Apache-2.0
// What --version prints.
#pragma once

#include <string>

namespace Tools {

// "NAME (poolctl) 1.2.3"
std::string versionOf(const std::string &name);

}  // namespace Tools
