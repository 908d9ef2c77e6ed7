// SPDX-License-Identifier: Apache-2.0
// Which cpu.weight keeps every CPU reservation while all groups are busy. Linux divides a parent's
// CPU time among its busy children in proportion to their weights, so the weights of all children
// of one parent follow from one another. Arithmetic only: no file is read or written here.
//
// From the top of the tree down, each group has a guaranteed part of the machine. A parent's
// guaranteed part, less what its children reserve, is free. Each child is guaranteed its own
// reservation and, in proportion to its shares, some of what is free; its weight is proportional to
// the two together. Where no child reserves anything, the weights are those of the shares.
//
// Limits. A weight is 1 to 10,000, so n siblings without a reservation take n/10,000 from a child
// that reserves nearly all of its parent. With 50 children a group one such level costs half a
// percent of that reservation. The spare part of host covers one or two such levels, not more.
#pragma once

#include <cstdint>

namespace Knob::Linux {

inline constexpr int64_t kMinCpuWeight = 1, kMaxCpuWeight = 10000;

// A part of the time of all CPUs, in units of 1/2^36 of the machine.
using MachinePart = uint64_t;
inline constexpr MachinePart kWholeMachine = MachinePart{1} << 36;

// What a reservation is of the machine, rounded up; all of it when it is more. percent: of one CPU,
// from 0 up. cpus: up to a million; 0 counts as 1.
MachinePart machinePart(int64_t percent, uint32_t cpus);

struct CpuChild {
  MachinePart reservation = 0;
  int64_t shareWeight = 0;  // the weight of its shares alone, 1 to 10,000
};

// One parent, and the sums over all its children.
struct CpuParent {
  MachinePart guaranteed = 0;   // what it gets while all groups are busy
  MachinePart reservation = 0;  // of all children
  uint64_t shareWeight = 0;     // of all children
  uint64_t children = 0;
};

// How a parent's time is divided. The weight of each child follows from this and from the child's
// own reservation and shares. The numbers are rounded, so they seldom change: while they stay the
// same, a change of one child leaves the weights of its siblings, and all below them, as they are.
struct CpuDivision {
  MachinePart whole =
      0;                 // the part that has a weight of 10,000; 0: weights are those of the shares
  MachinePart free = 0;  // what is divided by shares
  uint64_t shareWeight = 0;  // the shares that would get all that is free

  bool operator==(const CpuDivision &other) const {
    return whole == other.whole && free == other.free && shareWeight == other.shareWeight;
  }
  bool operator!=(const CpuDivision &other) const { return !(*this == other); }
};

CpuDivision divideCpu(const CpuParent &parent);

// At least this part is the child's while all groups are busy, but for the limits above. Only for a
// parent whose children reserve something.
MachinePart guaranteedPart(const CpuDivision &parent, const CpuChild &child);

// 1 to 10,000.
int64_t cpuWeightOf(const CpuDivision &parent, const CpuChild &child);

struct HostCpu {
  int64_t weight = 0;
  MachinePart guaranteed = 0;
  bool keepsReservation = true;  // false: it would take more than the largest weight
};

// For the group host, beside groups of other programs. Its part is the larger of what its shares
// give it and of its reservation with a twentieth of the rest (and 1/420 of the machine, which
// covers the limits above). othersWeight: the sum of the weights beside it.
HostCpu hostCpu(const CpuChild &host, uint64_t othersWeight);

}  // namespace Knob::Linux
