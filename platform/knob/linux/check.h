// SPDX-License-Identifier: Apache-2.0
// Recounts what records keep and compares records with files.
#pragma once

#include <string>
#include <vector>

#include "knob/linux/allocations.h"
#include "knob/linux/cgroup_tree.h"

namespace Knob::Linux {

// repair: mends what is found, as far as it can be. The caller holds the lock. Throws KernelError.
std::vector<Finding> checkTree(Groups &groups, Bookkeeper &books, const HostFacts &facts,
                               bool repair);

// The groups above cgroup-root whose memory.min is smaller than what host has promised: a protected
// group below one that is not is not protected.
std::vector<std::string> unprotectedAbove(const Groups &groups, int64_t promisedMB);

}  // namespace Knob::Linux
