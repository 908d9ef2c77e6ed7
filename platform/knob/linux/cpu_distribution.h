// SPDX-License-Identifier: Apache-2.0
// Writes cpu.weight of the groups: reads what cpu_weights needs from the records and from the
// groups beside host. While no group reserves CPU, each weight is that of the group's own shares.
//
// The caller holds the exclusive TreeLock, and the shared one for functions that only read.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <utility>

#include "knob/kernel.h"
#include "knob/linux/cgroup_tree.h"
#include "knob/linux/cpu_weights.h"
#include "knob/linux/record.h"
#include "knob/linux/undoable_writes.h"

namespace Knob::Linux {

// How a change alters the sums over the children of one parent.
struct CpuChildChange {
  GroupId parent = 0;
  int64_t count = 0, shareWeight = 0;
  bool isKnown = true;  // false: the sums may be without the child, which had no record
};

class CpuDistribution {
 public:
  // read: the record of a group, with no larger reservation than the groups above count.
  using Reader = std::function<StoredRecord(Group &)>;
  CpuDistribution(CgroupTree &tree, const HostFacts &facts, Reader read)
      : tree_(tree), facts_(facts), read_(std::move(read)) {}

  // Throws KernelError, reservation refused, where host cannot keep this reservation beside the
  // groups of other programs, whatever its weight. The message names them.
  void requireKept(const ResourceState &hostCpu) const;

  // Writes the weights, and the records of how the CPU is divided, after a change of a group: of
  // it, of the groups above, and of all others whose weight changes with theirs. The new
  // allocations and sums are in the records already. group: for one that was removed, its parent.
  // Throws KernelError.
  void update(UndoableWrites &writes, const GroupPtr &group, const CpuChildChange &change) const;

  // The weight that the records ask for, as far as they are up to date.
  int64_t recordedWeight(Group &group, const Record &record) const;

  StoredRecord readCounted(Group &group) const { return read_(group); }
  CpuChild childOf(const Record &record) const;
  HostCpu hostCpuBesideOthers(const Record &host) const;
  MachinePart partOf(int64_t percent) const { return machinePart(percent, facts_.cpus); }

  // Why host cannot keep its reservation, with the names and weights of the groups beside it.
  std::string tooHeavyText() const;

 private:
  CgroupTree &tree_;
  const HostFacts &facts_;
  Reader read_;
};

// The division and the sums of a group whose children, as counted, reserve this part in all.
CpuChildren dividedAmong(CpuChildren counted, MachinePart guaranteed, MachinePart reservation);

}  // namespace Knob::Linux
