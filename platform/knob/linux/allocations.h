// SPDX-License-Identifier: Apache-2.0
// Changes what groups have been given, and keeps the sums and the protection of the groups above
// correct. Callers hold the exclusive TreeLock, except where a function says otherwise.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "knob/linux/cgroup_tree.h"
#include "knob/linux/control_values.h"
#include "knob/linux/record.h"
#include "knob/linux/undoable_writes.h"

namespace Knob::Linux {

// A control file whose text is not what the record asks for.
struct Deviation {
  ControlText expected;
  std::optional<std::string> actual;  // absent: there is no such file
};

// "memory.max is 5, not max".
std::string textOf(const Deviation &deviation);

class AllocationManager {
 public:
  AllocationManager(CgroupTree &tree, const HostFacts &facts) : tree_(tree), facts_(facts) {}

  // Checks the whole change, then applies the whole change. Throws KernelError: bad parameter,
  // reservation refused, memory busy, failure (a record that cannot be read).
  void change(Group &group, Resource resource, const AllocationChange &change);

  // Removes a group, and its reservations from the sums of the groups above. Throws KernelError:
  // busy, failure; nothing has changed.
  void remove(Group &group, Group &parent);

  // The control files that differ from the record. Needs no more than the shared lock.
  std::vector<Deviation> deviations(const Group &group, const Record &record) const;

  int64_t capacity(Resource resource) const { return machineCapacity(facts_, resource); }

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
  void apply(Group &group, const StoredRecord &stored, Resource resource, const Allocation &wanted);
  void admitInto(std::vector<Ancestor> &ancestors, Group &group, Resource resource,
                 const ResourceState &own, const Allocation &wanted);
  ControlTexts currentTexts(const Group &group, const StoredRecord &stored,
                            Resource resource) const;
  void writeAncestor(UndoableWrites &writes, const Ancestor &ancestor) const;

  CgroupTree &tree_;
  const HostFacts &facts_;
};

}  // namespace Knob::Linux
