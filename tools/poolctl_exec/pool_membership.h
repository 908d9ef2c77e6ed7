// SPDX-License-Identifier: Apache-2.0
// Puts the calling process into a pool's group.
#pragma once

#include <string>

namespace Exec {

// Moves the calling process, as it is, into the group of that path; what it starts later is in
// there too. A pool that is disabled, itself or by one above it, is refused. Throws
// std::runtime_error, whose what() names the group and the reason; the process then is where it
// was.
void joinGroup(const std::string &path);

}  // namespace Exec
