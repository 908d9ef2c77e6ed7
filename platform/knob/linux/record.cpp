// SPDX-License-Identifier: Apache-2.0
// The layout: a version, flags, then 64-bit numbers in the machine's own byte order, since no
// record ever leaves the machine.
#include "knob/linux/record.h"

#include <cstring>

#include "knob/allocation.h"

namespace Knob::Linux {
namespace {

constexpr uint32_t kVersion = 1;
constexpr uint32_t kHasSavedHigh = 1;

#pragma pack(push, 1)
struct PackedState {
  int64_t min, max, minLimit, shares, childrenSum;
};
struct Packed {
  uint32_t version, flags;
  PackedState memory, cpu;
  uint64_t ownPeakKB, childrenPeakKB, savedHigh;
};
#pragma pack(pop)
static_assert(sizeof(PackedState) == 40 && sizeof(Packed) == kRecordSize);
static_assert(offsetof(Packed, memory) == 8 && offsetof(Packed, cpu) == 48 &&
              offsetof(Packed, ownPeakKB) == 88 && offsetof(Packed, savedHigh) == 104);

PackedState packed(const ResourceState &books) {
  const Allocation &allocation = books.allocation;
  return {allocation.min, allocation.max, allocation.minLimit, allocation.shares,
          books.childrenSum};
}

ResourceState unpacked(const PackedState &from) {
  return {{from.min, from.max, from.minLimit, from.shares}, from.childrenSum};
}

// An allocation that a set would refuse is none that a set has written.
bool isSound(const ResourceState &books) {
  try {
    (void)changedAllocation(books.allocation, {});
    return books.childrenSum >= 0;
  } catch (const KernelError &) {
    return false;
  }
}

}  // namespace

RecordBytes encode(const Record &record) {
  const Packed from{kVersion,
                    record.savedHigh ? kHasSavedHigh : 0,
                    packed(record.memory),
                    packed(record.cpu),
                    record.peaks.ownReservedPeakKB,
                    record.peaks.childrenReservedPeakKB,
                    record.savedHigh.value_or(0)};
  RecordBytes bytes;
  std::memcpy(bytes.data(), &from, sizeof from);
  return bytes;
}

std::optional<Record> decode(std::string_view bytes) {
  Packed from;
  if (bytes.size() != sizeof from) return std::nullopt;
  std::memcpy(&from, bytes.data(), sizeof from);
  if (from.version != kVersion || (from.flags & ~kHasSavedHigh) != 0) return std::nullopt;

  Record record{unpacked(from.memory),
                unpacked(from.cpu),
                {from.ownPeakKB, from.childrenPeakKB},
                std::nullopt};
  if ((from.flags & kHasSavedHigh) != 0) record.savedHigh = from.savedHigh;
  if (!isSound(record.memory) || !isSound(record.cpu)) return std::nullopt;
  return record;
}

}  // namespace Knob::Linux
