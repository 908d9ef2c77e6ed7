// SPDX-License-Identifier: Apache-2.0
// Changes what groups have been given, and keeps the sums and the protection of the groups above
// correct. Callers hold the exclusive TreeLock, except where a function says otherwise.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "knob/linux/capacity.h"
#include "knob/linux/cgroup_tree.h"
#include "knob/linux/control_values.h"
#include "knob/linux/cpu_distribution.h"
#include "knob/linux/record.h"
#include "knob/linux/undoable_writes.h"

namespace Knob::Linux {

// A control file whose text is not what the record asks for.
struct Deviation {
  ControlText expected;
  std::optional<std::string> actual;  // absent: the file does not exist
};

// "memory.max is 5, not max".
std::string textOf(const Deviation &deviation);

class AllocationManager {
 public:
  // The references must outlive this object.
  AllocationManager(CgroupTree &tree, const HostFacts &facts, const Reserve &reserve)
      : tree_(tree),
        capacity_(tree.hierarchy(), facts, reserve),
        cpu_(tree, facts, [this](Group &group) { return read(group); }) {}
  AllocationManager(const AllocationManager &) = delete;
  AllocationManager &operator=(const AllocationManager &) = delete;

  // The record of a group. A directory that belongs to another user is delegated, and its owner can
  // write the record: then no more is reserved than the group above counts for it. Throws
  // KernelError.
  StoredRecord read(Group &group);

  // Gives a new group its record. Throws KernelError; the caller then removes the group.
  void add(const GroupPtr &group, Group &parent);

  // Checks the whole change, then applies the whole change. Throws KernelError: bad parameter,
  // reservation refused, memory busy, failure (a record that cannot be read).
  void change(Group &group, Resource resource, const AllocationChange &change);

  // Removes a group, and its reservations from the sums of the groups above. Throws KernelError:
  // busy, failure; nothing has changed.
  void remove(Group &group, Group &parent);

  // The control files that differ from the record, and cpu.weight where it is not weight. Needs no
  // more than the shared lock.
  std::vector<Deviation> deviations(const Group &group, const Record &record, int64_t weight) const;

  const CpuDistribution &cpu() const { return cpu_; }

  // The oom_score_adj that the members of a group get.
  int oomScoreAdj(const Record &record) const;

  // What the machine can promise.
  const Account &account(Resource resource) { return capacity_.account(resource); }

 private:
  // A group above the one that changes.
  struct Ancestor {
    GroupPtr group;
    StoredRecord before;
    Record after;
  };

  // Adds to the ancestors' sums the minimum of a group that another program set and no record
  // counts. Returns whether it did; the caller must then read the record again.
  bool countForeignMinimum(Group &group, const StoredRecord &stored);
  StoredRecord readToChange(Group &group);
  int64_t countedFor(const Group &group, Group &parent, Resource resource);
  void apply(Group &group, const StoredRecord &stored, Resource resource, const Allocation &wanted);
  void protectMembers(const Group &group, const Record &before, const Record &after) const;
  [[noreturn]] void refuse(const Refusal &refusal, Resource resource, Group &group,
                           const std::vector<Ancestor> &ancestors);
  std::vector<Holder> largestReservations(Resource resource, const std::vector<std::string> &paths);
  void admitInto(std::vector<Ancestor> &ancestors, Group &group, Resource resource,
                 const ResourceState &own, const Allocation &wanted);
  ControlTexts currentTexts(const Group &group, const StoredRecord &stored,
                            Resource resource) const;
  void requireCpuKept(const std::vector<Ancestor> &ancestors, Group &group,
                      const ResourceState &own) const;
  void updateCpu(UndoableWrites &writes, Group &group, const StoredRecord &before,
                 const Record &after) const;
  void updateCpuWithout(Group &parent, const StoredRecord &removed) const;
  void writeAncestor(UndoableWrites &writes, const Ancestor &ancestor) const;

  CgroupTree &tree_;
  Capacity capacity_;
  CpuDistribution cpu_;
};

}  // namespace Knob::Linux
