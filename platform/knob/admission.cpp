// SPDX-License-Identifier: Apache-2.0
// A group is checked as soon as its new sum is known, so a refusal changes nothing.
#include "knob/admission.h"

#include <algorithm>
#include <limits>

namespace Knob {
namespace {

constexpr int64_t kMaxSum = std::numeric_limits<int64_t>::max();

bool withinOwnLimits(const ResourceState &state) {
  const int64_t reservation = reservationOf(state);
  const Allocation &limits = state.allocation;
  return (limits.max == -1 || reservation <= limits.max) &&
         (limits.minLimit == -1 || reservation <= limits.minLimit);
}

}  // namespace

int64_t reservationOf(const ResourceState &state) {
  return std::max(state.allocation.min, state.childrenSum);
}

int64_t changedSum(int64_t sum, int64_t before, int64_t after) {
  const int64_t others = std::max<int64_t>(sum - before, 0);
  return after > kMaxSum - others ? kMaxSum : others + after;
}

int64_t machineCapacity(const HostFacts &facts, Resource resource) {
  if (resource == Resource::kCpu) return int64_t{100} * facts.cpus;
  return static_cast<int64_t>(facts.memoryKB / 1024);
}

void requireNoneReservedBelow(const ResourceState &state, const Allocation &wanted) {
  if (wanted.max == 0 && state.childrenSum > 0) {
    throw KernelError(Status::kBusy, "child groups have reservations");
  }
}

std::optional<std::vector<ResourceState>> admit(std::vector<ResourceState> states,
                                                const Allocation &wanted, int64_t capacity) {
  int64_t before = reservationOf(states.front());
  states.front().allocation = wanted;
  if (!withinOwnLimits(states.front())) return std::nullopt;
  int64_t after = reservationOf(states.front());

  for (size_t above = 1; above < states.size(); ++above) {
    if (after == before) {
      states.resize(above);
      return states;
    }
    ResourceState &state = states[above];
    const int64_t stateBefore = reservationOf(state);
    state.childrenSum = changedSum(state.childrenSum, before, after);
    before = stateBefore;
    after = reservationOf(state);
    if (after > before && !withinOwnLimits(state)) return std::nullopt;
  }
  if (after > before && after > capacity) return std::nullopt;
  return states;
}

}  // namespace Knob
