// SPDX-License-Identifier: Apache-2.0
// The layout: a version, flags, then 64-bit numbers in the machine's own byte order, since a record
// never leaves the machine.
#include "knob/linux/record.h"

#include <algorithm>
#include <cstring>
#include <limits>

#include "knob/allocation.h"
#include "knob/linux/cgroup_files.h"
#include "knob/linux/control_values.h"
#include "knob/peaks.h"

namespace Knob::Linux {
namespace {

// Version 1 ended before the numbers of cpuChildren, which are counted where they are missing.
constexpr uint32_t kVersion = 2, kShorterVersion = 1;
constexpr size_t kShorterSize = 112;
constexpr uint32_t kHasSavedHigh = 1;

#pragma pack(push, 1)
struct PackedState {
  int64_t min, max, minLimit, shares, childrenSum;
};
struct Packed {
  uint32_t version, flags;
  PackedState memory, cpu;
  uint64_t ownPeakKB, childrenPeakKB, savedHigh;
  uint64_t children, childrenShareWeight, wholePart, freePart, divisionShareWeight;
};
#pragma pack(pop)
static_assert(sizeof(PackedState) == 40 && sizeof(Packed) == kRecordSize);
static_assert(offsetof(Packed, memory) == 8 && offsetof(Packed, cpu) == 48 &&
              offsetof(Packed, ownPeakKB) == 88 && offsetof(Packed, savedHigh) == 104 &&
              offsetof(Packed, children) == kShorterSize);

PackedState packed(const ResourceState &state) {
  const Allocation &allocation = state.allocation;
  return {allocation.min, allocation.max, allocation.minLimit, allocation.shares,
          state.childrenSum};
}

ResourceState unpacked(const PackedState &from) {
  return {{from.min, from.max, from.minLimit, from.shares}, from.childrenSum};
}

// Whether an operation can have written this.
bool isSound(const ResourceState &state) {
  try {
    (void)changedAllocation(state.allocation, {});
    return state.childrenSum >= 0;
  } catch (const KernelError &) {
    return false;
  }
}

bool isSound(const CpuChildren &children) {
  constexpr uint64_t kMaxCount = uint64_t{1} << 32;
  return children.count <= kMaxCount && children.shareWeight <= children.count * kMaxCpuWeight;
}

uint64_t limitIn(int directory, Control control) {
  const uint64_t initial = parseLimit(infoOf(control).initialText).value_or(0);
  const auto text = readControlIfAny(directory, infoOf(control).name);
  return text ? parseLimit(*text).value_or(initial) : initial;
}

// The nearest that our settings can express. No file holds a CPU minimum.
Record readFiles(int directory) {
  Record record;
  record.memory.allocation.min = minimumMegabytes(limitIn(directory, Control::kMemoryMin));
  record.memory.allocation.max = maximumMegabytes(limitIn(directory, Control::kMemoryMax));
  record.cpu.allocation.shares = sharesOfWeight(limitIn(directory, Control::kCpuWeight));
  constexpr int64_t kMaxPercent = std::numeric_limits<int32_t>::max();
  if (const auto text = readControlIfAny(directory, infoOf(Control::kCpuMax).name)) {
    record.cpu.allocation.max = std::min(parseCpuMax(*text).value_or(-1), kMaxPercent);
  }
  record.peaks = raisedPeaks({}, record.memory.allocation.min, 0);
  return record;
}

}  // namespace

RecordBytes encode(const Record &record) {
  const Packed from{kVersion,
                    record.savedHigh ? kHasSavedHigh : 0,
                    packed(record.memory),
                    packed(record.cpu),
                    record.peaks.ownReservedPeakKB,
                    record.peaks.childrenReservedPeakKB,
                    record.savedHigh.value_or(0),
                    record.cpuChildren.count,
                    record.cpuChildren.shareWeight,
                    record.cpuChildren.division.whole,
                    record.cpuChildren.division.free,
                    record.cpuChildren.division.shareWeight};
  RecordBytes bytes;
  std::memcpy(bytes.data(), &from, sizeof from);
  return bytes;
}

std::optional<Record> decode(std::string_view bytes) {
  Packed from{};
  if (bytes.size() != sizeof from && bytes.size() != kShorterSize) return std::nullopt;
  std::memcpy(&from, bytes.data(), bytes.size());
  if (from.version != (bytes.size() == sizeof from ? kVersion : kShorterVersion)) {
    return std::nullopt;
  }
  if ((from.flags & ~kHasSavedHigh) != 0) return std::nullopt;

  Record record{unpacked(from.memory),
                unpacked(from.cpu),
                {from.children,
                 from.childrenShareWeight,
                 {from.wholePart, from.freePart, from.divisionShareWeight}},
                {from.ownPeakKB, from.childrenPeakKB},
                std::nullopt};
  if ((from.flags & kHasSavedHigh) != 0) record.savedHigh = from.savedHigh;
  if (!isSound(record.memory) || !isSound(record.cpu) || !isSound(record.cpuChildren)) {
    return std::nullopt;
  }
  return record;
}

StoredRecord readRecord(int directory) {
  const auto bytes = readAttribute(directory, kRecordAttribute);
  if (!bytes) return {readFiles(directory), false, false};
  if (const auto record = decode(*bytes)) return {*record, true, false};
  return {readFiles(directory), false, true};
}

void writeRecord(int directory, const Record &record) {
  const RecordBytes bytes = encode(record);
  writeAttribute(directory, kRecordAttribute, {bytes.data(), bytes.size()});
}

void writeFirstRecord(int directory) {
  const RecordBytes bytes = encode(Record());
  try {
    writeAttribute(directory, kRecordAttribute, {bytes.data(), bytes.size()}, Attribute::kNew);
  } catch (const KernelError &error) {
    if (error.status != Status::kExists) throw;
  }
}

}  // namespace Knob::Linux
