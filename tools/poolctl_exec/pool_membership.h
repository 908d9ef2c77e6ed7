// SPDX-License-Identifier: Apache-2.0
// Puts the calling process into a pool's group.
#pragma once

#include <string>

namespace Exec {

// The path of the group that a pool's name stands for, by the rule of definition files: a name
// that does not begin with "host/" stands below host/opt.
std::string groupPath(const std::string &pool);

// Moves the calling process, as it is, into the group of that path; what it starts later is in
// there too. A pool that is disabled, itself or by one above it, is refused. Throws
// std::runtime_error, whose what() names the group and the reason; the process then is where it
// was.
void joinGroup(const std::string &path);

// Gives the calling process an oom_score_adj, -1000 to 1000, which the command keeps. Throws
// std::system_error.
void setOomScoreAdj(int value);

}  // namespace Exec
