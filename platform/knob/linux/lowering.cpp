// SPDX-License-Identifier: Apache-2.0
// Linux kills at once when memory.max is set below what cannot be reclaimed; memory.high never
// kills. So memory.high is lowered first, and memory.max follows only when the memory was given up.
#include "knob/linux/lowering.h"

#include "knob/linux/control_values.h"

namespace Knob::Linux {
namespace {

std::string limitText(uint64_t limit) {
  return limit == kUnlimited ? "max" : std::to_string(limit);
}

uint64_t readLimit(const Group &group, const char *name) {
  return parseLimit(readControl(group.fd(), name)).value_or(kUnlimited);
}

void writeHigh(const Group &group, uint64_t limit) {
  const int error = writeControl(group.fd(), kMemoryHighFile, limitText(limit));
  if (error != 0) fail(error, std::string("cannot write ") + kMemoryHighFile);
}

[[noreturn]] void refuse(uint64_t usedBytes) {
  throw KernelError(Status::kMemoryBusy,
                    "living processes use " + std::to_string(usedBytes) + " bytes");
}

// Keeps memory.high at the new maximum while this object lives. The record holds the former value
// meanwhile, so that it can be restored after a crash.
class LoweredHigh {
 public:
  LoweredHigh(Group &group, const StoredRecord &stored, uint64_t limit)
      : group_(group), stored_(stored), saved_(readLimit(group, kMemoryHighFile)) {
    if (saved_ <= limit) return;
    Record noted = stored.record;
    // No sum counts the minimum of a group without a record, and check() would expect it there.
    if (!stored.isStored) noted.memory.allocation.min = 0;
    noted.savedHigh = saved_;
    writeRecord(group.fd(), noted);
    isLowered_ = true;
    try {
      writeHigh(group, limit);
    } catch (const KernelError &) {
      restore();
      throw;
    }
  }
  ~LoweredHigh() { restore(); }
  LoweredHigh(const LoweredHigh &) = delete;
  LoweredHigh &operator=(const LoweredHigh &) = delete;

 private:
  void restore() noexcept {
    if (!isLowered_) return;
    isLowered_ = false;
    try {
      writeHigh(group_, saved_);
      if (stored_.isStored) {
        writeRecord(group_.fd(), stored_.record);
      } else {
        removeAttribute(group_.fd(), kRecordAttribute);
      }
    } catch (const std::exception &) {
      // The record still holds the former value; check() and the next change restore it.
    }
  }

  Group &group_;
  const StoredRecord &stored_;
  const uint64_t saved_;
  bool isLowered_ = false;
};

void askToReclaim(const Group &group, uint64_t bytes) {
  // It fails with EAGAIN when not all could be reclaimed, and older kernels do not have this file.
  // What counts is memory.current afterwards.
  (void)writeControl(group.fd(), kMemoryReclaimFile, std::to_string(bytes));
}

}  // namespace

bool isLowerLimit(const std::string &before, const std::string &after) {
  return parseLimit(after).value_or(kUnlimited) < parseLimit(before).value_or(kUnlimited);
}

void lowerMemoryMax(CgroupTree &tree, Group &group, const StoredRecord &stored,
                    const std::string &before, const std::string &after, UndoableWrites &writes) {
  if (!tree.isPopulated(group)) return writes.write(group, Control::kMemoryMax, before, after);
  const uint64_t limit = parseLimit(after).value_or(kUnlimited);
  uint64_t used = readLimit(group, kMemoryCurrentFile);
  // No process can live without memory, so all reclaim would be in vain.
  if (limit == 0) refuse(used);
  const LoweredHigh lowered(group, stored, limit);
  if (used > limit) {
    askToReclaim(group, used - limit);
    used = readLimit(group, kMemoryCurrentFile);
    if (used > limit) refuse(used);
  }
  writes.write(group, Control::kMemoryMax, before, after);
}

LiftedMaximum::LiftedMaximum(CgroupTree &tree, GroupPtr group) {
  const char *name = infoOf(Control::kMemoryMax).name;
  std::vector<GroupPtr> zero;
  for (; group; group = tree.parentOf(*group)) {
    if (readControlIfAny(group->fd(), name) != "0") continue;
    if (tree.isPopulated(*group)) {
      throw KernelError(Status::kOutOfMemory, "the memory maximum of " + tree.nameOf(*group) +
                                                  " is 0, and processes are in it");
    }
    zero.push_back(group);
  }
  for (const GroupPtr &each : zero) {
    lifted_.push_back(each);
    tree.write(*each, Control::kMemoryMax, "max");
  }
}

// Without a process in them, Linux writes the maximum without killing.
LiftedMaximum::~LiftedMaximum() {
  for (const GroupPtr &group : lifted_) {
    (void)writeControl(group->fd(), infoOf(Control::kMemoryMax).name, "0");
  }
}

void restoreMemoryHigh(Group &group, Record &record) {
  writeHigh(group, *record.savedHigh);
  record.savedHigh.reset();
  writeRecord(group.fd(), record);
}

}  // namespace Knob::Linux
