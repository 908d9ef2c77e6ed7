// SPDX-License-Identifier: Apache-2.0
// The kernel's records of what a scheduler group may have, in the layout of its allocation nodes.
#pragma once

#include <cstddef>
#include <cstdint>

namespace Sched {

#pragma pack(push, 1)

// Megabytes. -1: no limit, or not given.
struct MemAllocation {
  int64_t min;
  int64_t max;
  int64_t shares;
  int64_t minLimit;
  uint32_t kernelWord;  // written by the kernel on a read, never used here
};

// Percent of one CPU. -1: no limit, or not given.
struct CpuAllocation {
  int32_t min;
  int32_t max;
  int32_t shares;
  int32_t minLimit;
  uint32_t kernelWord;  // written by the kernel on a read, never used here
};

#pragma pack(pop)

static_assert(sizeof(MemAllocation) == 36 && alignof(MemAllocation) == 1);
static_assert(offsetof(MemAllocation, min) == 0 && offsetof(MemAllocation, max) == 8 &&
              offsetof(MemAllocation, shares) == 16 && offsetof(MemAllocation, minLimit) == 24);
static_assert(sizeof(CpuAllocation) == 20 && alignof(CpuAllocation) == 1);
static_assert(offsetof(CpuAllocation, min) == 0 && offsetof(CpuAllocation, max) == 4 &&
              offsetof(CpuAllocation, shares) == 8 && offsetof(CpuAllocation, minLimit) == 12);

}  // namespace Sched
