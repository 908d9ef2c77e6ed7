// SPDX-License-Identifier: Apache-2.0
// Lowering memory.max of a group without killing the processes in it, and lifting one of 0 where
// Linux needs memory for a new group.
#pragma once

#include <string>
#include <vector>

#include "knob/linux/cgroup_tree.h"
#include "knob/linux/record.h"
#include "knob/linux/undoable_writes.h"

namespace Knob::Linux {

// Whether the second text of memory.max is a lower limit than the first.
bool isLowerLimit(const std::string &before, const std::string &after);

// Writes a lower memory.max. Where processes live in the group or below it, asks the kernel to
// reclaim first, and writes only when what they use fits. before: the file's text now. Throws
// KernelError: memory busy, and nothing has changed.
void lowerMemoryMax(CgroupTree &tree, Group &group, const StoredRecord &stored,
                    const std::string &before, const std::string &after, UndoableWrites &writes);

// Restores memory.high after the process died that had lowered it, and removes the note from the
// record. Throws KernelError.
void restoreMemoryHigh(Group &group, Record &record);

// Linux takes the memory for a new group from the group above, and fails where its memory.max, or
// that of one further up, is 0. While this object lives, a group and those above it have no maximum
// of 0. Throws KernelError: out of memory, when processes are in or below one of them, which could
// use the memory.
class LiftedMaximum {
 public:
  LiftedMaximum(CgroupTree &tree, GroupPtr group);
  ~LiftedMaximum();
  LiftedMaximum(const LiftedMaximum &) = delete;
  LiftedMaximum &operator=(const LiftedMaximum &) = delete;

 private:
  std::vector<GroupPtr> lifted_;
};

}  // namespace Knob::Linux
