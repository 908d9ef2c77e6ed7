// SPDX-License-Identifier: Apache-2.0
// Whether a reservation fits: within the group's own limits, those of every group above it, and the
// machine. Plain functions on values; a kernel reads the values before and stores them after.
//
// A group reserves the larger of its own min and the sum of what its children reserve.
#pragma once

#include <optional>
#include <vector>

#include "knob/kernel.h"

namespace Knob {

// One group as admission sees it.
struct Level {
  Allocation allocation;
  int64_t childrenSum = 0;  // of the children's reservations
};

int64_t reservationOf(const Level &level);

// How much can be reserved in all: MB of physical memory, or 100 percent for each CPU.
int64_t machineCapacity(const HostFacts &facts, Resource resource);

// levels: the group first, then every group above it, up to the root. Gives the levels as they are
// once the group has the wanted allocation, or nothing when that does not fit. The levels beyond
// the last one that changes are left out.
std::optional<std::vector<Level>> admit(std::vector<Level> levels, const Allocation &wanted,
                                        int64_t capacity);

}  // namespace Knob
