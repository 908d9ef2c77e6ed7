// SPDX-License-Identifier: Apache-2.0
// Taking memory from a group that lives, without killing what lives in it.
#pragma once

#include "knob/linux/allocations.h"
#include "knob/linux/cgroup_tree.h"
#include "knob/linux/undoable_writes.h"

namespace Knob::Linux {

// Comes before memory.max is lowered. Without living processes there is nothing to do; with them it
// is lowered here, and only when what they hold, after the kernel was asked to reclaim, fits.
// Throws KernelError: memory busy, and nothing has changed.
void makeRoomBelow(Groups &groups, Group &group, const Held &held, int64_t maxMB, Writes &writes);

// Puts memory.high back where a process died that had lowered it, and takes that from the record.
void restoreMemoryHigh(Group &group, Record &record);

}  // namespace Knob::Linux
