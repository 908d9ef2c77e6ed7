// SPDX-License-Identifier: Apache-2.0
// All products stay below 2^64: a part has 37 bits, a weight 14, and the sum of the other groups'
// weights is cut to 27.
#include "knob/linux/cpu_weights.h"

#include <algorithm>

namespace Knob::Linux {
namespace {

// Up to this many children the division is finer, since a new one means few writes.
constexpr uint64_t kFewChildren = 8;
constexpr uint64_t kMaxOthersWeight = uint64_t{1} << 27;

uint64_t ceilDivided(uint64_t value, uint64_t divisor) {
  return (value + divisor - 1) / divisor;
}

// The distance between neighbouring numbers of three binary digits, each at most 5/4 of the one
// below it, at the size of value.
uint64_t stepAt(uint64_t value) {
  uint64_t step = 1;
  while (value / step >= 8) step *= 2;
  return step;
}

uint64_t roundedDown(uint64_t value) {
  const uint64_t step = stepAt(value);
  return value / step * step;
}

uint64_t roundedUp(uint64_t value) {
  const uint64_t step = stepAt(value);
  return ceilDivided(value, step) * step;
}

MachinePart partBeside(int64_t weight, uint64_t othersWeight) {
  const auto own = static_cast<uint64_t>(weight);
  return kWholeMachine * own / (own + othersWeight);
}

uint64_t powerOfTwoFrom(uint64_t value) {
  uint64_t power = 1;
  while (power < value) power *= 2;
  return power;
}

}  // namespace

MachinePart machinePart(int64_t percent, uint32_t cpus) {
  const uint64_t all = uint64_t{100} * std::max<uint32_t>(cpus, 1);
  const uint64_t reserved = std::min(static_cast<uint64_t>(std::max<int64_t>(percent, 0)), all);
  return ceilDivided(reserved * kWholeMachine, all);
}

CpuDivision divideCpu(const CpuParent &parent) {
  if (parent.reservation == 0) return {};
  // CPUs that went away can leave less guaranteed than reserved.
  const MachinePart guaranteed = std::max(parent.guaranteed, parent.reservation);
  const MachinePart free = guaranteed - parent.reservation;
  const MachinePart whole = roundedUp(guaranteed);
  if (parent.children <= 1) return {whole, free, parent.shareWeight};
  // Only a part of what is free is divided by shares. All children get of the rest in proportion to
  // their weights, which makes up for the weights of 1 that stand for less.
  if (parent.children <= kFewChildren) {
    return {whole, roundedDown(free * 3 / 4), roundedUp(parent.shareWeight)};
  }
  // 5/8, rounded down by at most a fifth, is at least half, and so is the sum of the shares in its
  // power of two: together at least the quarter that a group without a reservation is promised.
  return {whole, roundedDown(free * 5 / 8), powerOfTwoFrom(parent.shareWeight)};
}

MachinePart guaranteedPart(const CpuDivision &parent, const CpuChild &child) {
  const auto shareWeight = static_cast<uint64_t>(child.shareWeight);
  return child.reservation + parent.free * shareWeight / std::max<uint64_t>(parent.shareWeight, 1);
}

int64_t cpuWeightOf(const CpuDivision &parent, const CpuChild &child) {
  if (parent.whole == 0) return child.shareWeight;
  const uint64_t weight = ceilDivided(guaranteedPart(parent, child) * kMaxCpuWeight, parent.whole);
  return std::clamp(static_cast<int64_t>(weight), kMinCpuWeight, kMaxCpuWeight);
}

HostCpu hostCpu(const CpuChild &host, uint64_t othersWeight) {
  if (othersWeight == 0) return {host.shareWeight, kWholeMachine, true};
  const uint64_t others = std::min(othersWeight, kMaxOthersWeight);
  const MachinePart fair = partBeside(host.shareWeight, others);
  if (host.reservation == 0) return {host.shareWeight, fair, true};

  const MachinePart floor =
      host.reservation + (kWholeMachine - host.reservation) / 20 + kWholeMachine / 420;
  if (floor <= fair) return {host.shareWeight, fair, true};
  if (floor < kWholeMachine) {
    const uint64_t weight = ceilDivided(others * floor, kWholeMachine - floor);
    if (weight <= static_cast<uint64_t>(kMaxCpuWeight)) {
      return {static_cast<int64_t>(weight), floor, true};
    }
  }
  return {kMaxCpuWeight, partBeside(kMaxCpuWeight, others), false};
}

}  // namespace Knob::Linux
