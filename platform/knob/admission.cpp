// SPDX-License-Identifier: Apache-2.0
// Sums saturate: a number beyond them is beyond every machine too, and is refused as such.
#include "knob/admission.h"

#include <algorithm>
#include <limits>

namespace Knob {
namespace {

constexpr int64_t kMost = std::numeric_limits<int64_t>::max();

bool withinOwnLimits(const Level &level) {
  const int64_t reservation = reservationOf(level);
  const Allocation &limits = level.allocation;
  return (limits.max == -1 || reservation <= limits.max) &&
         (limits.minLimit == -1 || reservation <= limits.minLimit);
}

// The sum after one child's part of it went from before to after; before is part of the sum.
int64_t replaced(int64_t sum, int64_t before, int64_t after) {
  const int64_t others = sum - before;
  return after > kMost - others ? kMost : others + after;
}

}  // namespace

int64_t reservationOf(const Level &level) {
  return std::max(level.allocation.min, level.childrenSum);
}

int64_t machineCapacity(const HostFacts &facts, Resource resource) {
  if (resource == Resource::kCpu) return int64_t{100} * facts.cpus;
  return static_cast<int64_t>(facts.memoryKB / 1024);
}

std::optional<std::vector<Level>> admit(std::vector<Level> levels, const Allocation &wanted,
                                        int64_t capacity) {
  int64_t before = reservationOf(levels.front());
  levels.front().allocation = wanted;
  if (!withinOwnLimits(levels.front())) return std::nullopt;
  int64_t after = reservationOf(levels.front());

  for (size_t above = 1; above < levels.size(); ++above) {
    if (after == before) {
      levels.resize(above);
      return levels;
    }
    Level &level = levels[above];
    const int64_t levelBefore = reservationOf(level);
    level.childrenSum = replaced(level.childrenSum, before, after);
    before = levelBefore;
    after = reservationOf(level);
    if (after > before && !withinOwnLimits(level)) return std::nullopt;
  }
  if (after > before && after > capacity) return std::nullopt;
  return levels;
}

}  // namespace Knob
