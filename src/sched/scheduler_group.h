// SPDX-License-Identifier: Apache-2.0
// The kernel's scheduler groups. Each operation is one exchange with the kernel, except
// createGroup, and throws Sched::Exception, whose message begins with the interface call that
// failed. A path that contains a NUL is a bad parameter.
#pragma once

#include <cstdint>
#include <string>

#include "sched/allocation.h"

namespace Sched {

// The id of the group of that path.
int64_t pathNameToId(const std::string &path);

// Read the allocation of a group; *allocation is unchanged on failure.
void getMemAllocation(int64_t id, MemAllocation *allocation);
void getCpuAllocation(int64_t id, CpuAllocation *allocation);

// Set min, max and minLimit, and the shares unless they are -1.
void setMemAllocation(int64_t id, const MemAllocation &allocation);
void setCpuAllocation(int64_t id, const CpuAllocation &allocation);

void deleteGroup(int64_t id);

// Looks the parent up, creates the group and sets both allocations. If an allocation is refused,
// the group is deleted again, and the refusal is nested in an exception that names the path. If
// that deletion fails, its exception is thrown instead and the group stays.
void createGroup(const std::string &path, const MemAllocation &mem, const CpuAllocation &cpu);

}  // namespace Sched
