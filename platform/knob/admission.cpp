// SPDX-License-Identifier: Apache-2.0
// A group is checked as soon as its new sum is known, so a refusal changes nothing.
#include "knob/admission.h"

#include <algorithm>
#include <limits>

namespace Knob {
namespace {

constexpr int64_t kMaxSum = std::numeric_limits<int64_t>::max();

// The largest reservation that a group's own limits allow.
int64_t ownLimit(const ResourceState &state) {
  int64_t limit = kMaxSum;
  for (const int64_t each : {state.allocation.max, state.allocation.minLimit}) {
    if (each != -1) limit = std::min(limit, each);
  }
  return limit;
}

// Always nothing.
std::nullopt_t refused(Refusal *refusal, const Refusal &why) {
  if (refusal != nullptr) *refusal = why;
  return std::nullopt;
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
                                                const Allocation &wanted, int64_t capacity,
                                                Refusal *refusal) {
  int64_t before = reservationOf(states.front());
  states.front().allocation = wanted;
  int64_t after = reservationOf(states.front());
  if (const int64_t limit = ownLimit(states.front()); after > limit) {
    return refused(refusal, {0, after - before, limit - before});
  }

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
    if (const int64_t limit = ownLimit(state); after > before && after > limit) {
      return refused(refusal, {above, after - before, limit - before});
    }
  }
  if (after > before && after > capacity) {
    return refused(refusal, {states.size(), after - before, capacity - before});
  }
  return states;
}

}  // namespace Knob
