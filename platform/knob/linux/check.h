// SPDX-License-Identifier: Apache-2.0
// Recounts the sums in the records, and compares records with control files.
#pragma once

#include <string>
#include <vector>

#include "knob/linux/allocations.h"
#include "knob/linux/cgroup_tree.h"

namespace Knob::Linux {

// repair: repairs what is found, as far as possible. The caller holds the TreeLock: exclusive to
// repair, else shared. Throws KernelError.
std::vector<Finding> checkTree(CgroupTree &tree, AllocationManager &allocations, bool repair);

// One text for each group above host whose memory.min is smaller than what host has promised: a
// protected group below one that is not protected is not protected either.
std::vector<std::string> unprotectedAbove(const Hierarchy &hierarchy, int64_t promisedMB);

}  // namespace Knob::Linux
