// SPDX-License-Identifier: Apache-2.0
// The rule that turns the name of a pool into the path of its group.
#pragma once

#include <string>

namespace Loader {

// A name that begins with "host/" is a whole path; any other is relative to "host/opt".
inline std::string groupPath(const std::string &name) {
  return name.compare(0, 5, "host/") == 0 ? name : "host/opt/" + name;
}

}  // namespace Loader
