// SPDX-License-Identifier: Apache-2.0
// The kernel's scheduler groups. Each operation is one exchange with the kernel and throws
// Sched::Exception, whose message begins with the interface call that failed.
#pragma once

#include <cstdint>
#include <string>

#include "sched/allocation.h"

namespace Sched {

// The id of the group of that path.
int64_t pathNameToId(const std::string &path);

// Fill *allocation with what the kernel says; untouched on failure.
void getMemAllocation(int64_t id, MemAllocation *allocation);
void getCpuAllocation(int64_t id, CpuAllocation *allocation);

// Set min, max and minLimit, and the shares unless they are -1.
void setMemAllocation(int64_t id, const MemAllocation &allocation);
void setCpuAllocation(int64_t id, const CpuAllocation &allocation);

void deleteGroup(int64_t id);

// Makes the group, whose parent must exist, with both allocations. When an allocation is refused
// the group is deleted again and the refusal is nested in an exception that names the path.
void createGroup(const std::string &path, const MemAllocation &mem, const CpuAllocation &cpu);

}  // namespace Sched
