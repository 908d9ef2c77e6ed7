// SPDX-License-Identifier: Apache-2.0
// The kernel calls of the option mode. They return statuses; the operations of the sub-commands
// throw.
#pragma once

#include <cstdint>

#include "platform/knob.h"

namespace Legacy {

struct MemoryReport {
  int64_t minMB = 0;
  int64_t maxMB = 0;
  uint64_t ownPeakKB = 0;       // of the group's reserved minimum
  uint64_t childrenPeakKB = 0;  // of its children's
};

// Each returns 0 or the kernel's status, and does not change its result unless it returns 0. A
// parameter list that cannot be created is "out of memory".
KNOB_ReturnStatus lookUpGroup(const char *path, int64_t *id);
KNOB_ReturnStatus countMemberGroups(int64_t id, int *count);
KNOB_ReturnStatus readMemoryReport(int64_t id, MemoryReport *report);
KNOB_ReturnStatus setGroupMemSize(int64_t id, int sizeMB);

}  // namespace Legacy
