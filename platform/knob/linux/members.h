// SPDX-License-Identifier: Apache-2.0
// The processes of a group.
#pragma once

#include <cstdint>
#include <vector>

#include "knob/linux/cgroup_tree.h"

namespace Knob::Linux {

// The living processes that are in the group itself. One that this process cannot name, from
// outside its process-id space, is left out.
std::vector<int64_t> readMembers(const Group &group);

// Moves a process into a group without child groups. Throws KernelError: not found (no such living
// process), bad parameter (a process of the kernel's own).
void addMember(Group &group, int64_t pid);

// The process ids of a text of cgroup.procs.
std::vector<int64_t> parseMembers(std::string_view text);

}  // namespace Knob::Linux
