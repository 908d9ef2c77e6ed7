// SPDX-License-Identifier: Apache-2.0
// Whether a reservation fits: within the group's own limits, those of every group above it, and the
// machine. Plain functions on values; a kernel reads the values before and stores them after.
//
// A group reserves the larger of its own min and the sum of what its children reserve.
#pragma once

#include <cstddef>
#include <optional>
#include <vector>

#include "knob/kernel.h"

namespace Knob {

// What a group has been given of one resource, and what its children reserve of it.
struct ResourceState {
  Allocation allocation;
  int64_t childrenSum = 0;  // of the children's reservations
};

int64_t reservationOf(const ResourceState &state);

// The children's sum after the reservation of one child went from before to after. Saturates: a
// larger number would exceed every machine too. A before that the sum cannot contain, which only
// another program writes, counts as the whole sum.
int64_t changedSum(int64_t sum, int64_t before, int64_t after);

// How much can be reserved in all: MB of physical memory, or 100 percent for each CPU.
int64_t machineCapacity(const HostFacts &facts, Resource resource);

// Throws KernelError, busy, for a maximum of 0 while child groups have reservations. The caller
// disables the group, and can wait until they are deleted; a refusal would be final.
void requireNoneReservedBelow(const ResourceState &state, const Allocation &wanted);

// Why a reservation does not fit. asked: how much more the group at the index "at" would reserve;
// free: how much more it may. at is the number of states when it is the machine that has no room.
struct Refusal {
  size_t at;
  int64_t asked, free;
};

// states: of the group first, then of every group above it, up to the root. Returns the states
// after the group has the wanted allocation, up to the last one that changes; nothing when the
// allocation does not fit, and refusal, where given, says why.
std::optional<std::vector<ResourceState>> admit(std::vector<ResourceState> states,
                                                const Allocation &wanted, int64_t capacity,
                                                Refusal *refusal = nullptr);

}  // namespace Knob
