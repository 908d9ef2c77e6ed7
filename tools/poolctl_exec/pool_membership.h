// SPDX-License-Identifier: Apache-2.0
// Puts the calling process into a pool's group.
#pragma once

#include <string>

namespace Exec {

// Moves the calling process into the group of that path; its later child processes start there. A
// pool that is disabled, or is below a disabled one, is refused. Throws std::runtime_error, whose
// what() names the group and the reason; the process has then not moved.
void joinGroup(const std::string &path);

// Gives the calling process an oom_score_adj, -1000 to 1000, which the command keeps. Throws
// std::system_error.
void setOomScoreAdj(int value);

}  // namespace Exec
