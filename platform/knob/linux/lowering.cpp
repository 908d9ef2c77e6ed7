// SPDX-License-Identifier: Apache-2.0
// Linux kills at once when memory.max goes below what cannot be reclaimed; memory.high never kills.
// So memory.high is lowered first, and memory.max follows only when the memory has come.
#include "knob/linux/lowering.h"

#include <string>

#include "knob/linux/control_values.h"
#include "knob/linux/errno_status.h"

namespace Knob::Linux {
namespace {

std::string limitText(uint64_t limit) {
  return limit == kUnlimited ? "max" : std::to_string(limit);
}

uint64_t readLimit(const Group &group, const char *name) {
  return parseLimit(readControl(group.directory, name)).value_or(kUnlimited);
}

void writeHigh(const Group &group, uint64_t limit) {
  const int error = writeControl(group.directory, kMemoryHighFile, limitText(limit));
  if (error != 0) fail(error, std::string("cannot write ") + kMemoryHighFile);
}

[[noreturn]] void refuse(uint64_t usedBytes) {
  throw KernelError(Status::kMemoryBusy,
                    "living processes hold " + std::to_string(usedBytes) + " bytes");
}

// memory.high at the new maximum for as long as this lives. The record says so first: whoever comes
// after a crash puts it back.
class LoweredHigh {
 public:
  LoweredHigh(Group &group, const Held &held, uint64_t limit)
      : group_(group), before_(held), saved_(readLimit(group, kMemoryHighFile)) {
    if (saved_ <= limit) return;
    Record noted = held.record;
    // An unrecorded minimum is counted nowhere, and must not look as if it were.
    if (!held.isStored) noted.memory.allocation.min = 0;
    noted.savedHigh = saved_;
    writeRecord(group_, noted, held.isStored ? Attribute::kAny : Attribute::kNew);
    isLowered_ = true;
    try {
      writeHigh(group_, limit);
    } catch (const KernelError &) {
      putBack();
      throw;
    }
  }
  ~LoweredHigh() { putBack(); }
  LoweredHigh(const LoweredHigh &) = delete;
  LoweredHigh &operator=(const LoweredHigh &) = delete;

 private:
  void putBack() noexcept {
    if (!isLowered_) return;
    isLowered_ = false;
    try {
      writeHigh(group_, saved_);
      if (before_.isStored) {
        writeRecord(group_, before_.record);
      } else {
        removeAttribute(group_.directory, kRecordAttribute);
      }
    } catch (const KernelError &) {
      // The record still says what belongs there; check() and the next change put it back.
    }
  }

  Group &group_;
  const Held &before_;
  const uint64_t saved_;
  bool isLowered_ = false;
};

void askToReclaim(const Group &group, uint64_t bytes) {
  // It answers EAGAIN when not all could be had, and older kernels have no such file: what counts
  // is what memory.current says afterwards.
  (void)writeControl(group.directory, kMemoryReclaimFile, std::to_string(bytes));
}

}  // namespace

void makeRoomBelow(Groups &groups, Group &group, const Held &held, int64_t maxMB, Writes &writes) {
  if (!groups.isPopulated(group)) return;
  const std::string before = readControl(group.directory, rowOf(Control::kMemoryMax).name);
  const std::string after = memoryText(maxMB);
  const uint64_t limit = parseLimit(after).value_or(kUnlimited);
  uint64_t used = readLimit(group, kMemoryCurrentFile);
  // Whatever lives needs some: what can only fail need not push everything out of memory first.
  if (limit == 0) refuse(used);
  const LoweredHigh lowered(group, held, limit);
  if (used > limit) {
    askToReclaim(group, used - limit);
    used = readLimit(group, kMemoryCurrentFile);
    if (used > limit) refuse(used);
  }
  writes.control(group, Control::kMemoryMax, before, after);
}

void restoreMemoryHigh(Group &group, Record &record) {
  writeHigh(group, *record.savedHigh);
  record.savedHigh.reset();
  writeRecord(group, record);
}

}  // namespace Knob::Linux
