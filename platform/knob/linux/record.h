// SPDX-License-Identifier: Apache-2.0
// What Linux has no file for: the record of a group, kept in one extended attribute of its
// directory, so that it is deleted with the group. libknob writes one for each group that it makes;
// a group without a record was made by another program.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "knob/admission.h"
#include "knob/kernel.h"
#include "knob/linux/cpu_weights.h"

namespace Knob::Linux {

inline constexpr const char *kRecordAttribute = "user.knob";

// The sums over all children that CPU weights follow from, and how they divide the CPU. All 0 while
// the children reserve no CPU.
struct CpuChildren {
  uint64_t count = 0;
  uint64_t shareWeight = 0;
  CpuDivision division;

  bool operator==(const CpuChildren &other) const {
    return count == other.count && shareWeight == other.shareWeight && division == other.division;
  }
  bool operator!=(const CpuChildren &other) const { return !(*this == other); }
};

struct Record {
  ResourceState memory, cpu;
  CpuChildren cpuChildren;
  MemoryStatistics peaks;
  // The value of memory.high, in bytes or kUnlimited, while it is lowered to make a smaller maximum
  // possible. Another process that finds it here restores it: the one that lowered it has died.
  std::optional<uint64_t> savedHigh;

  ResourceState &state(Resource resource) { return resource == Resource::kMemory ? memory : cpu; }
  const ResourceState &state(Resource resource) const {
    return resource == Resource::kMemory ? memory : cpu;
  }
};

// A group's record as it is stored, or what its control files say where no record is stored.
struct StoredRecord {
  Record record;
  bool isStored = false;
  bool isDamaged = false;  // there is a record, but it cannot be read
};

inline constexpr size_t kRecordSize = 152;
using RecordBytes = std::array<char, kRecordSize>;

RecordBytes encode(const Record &record);

// Nothing: another version, another size, or values that no operation writes.
std::optional<Record> decode(std::string_view bytes);

// directory: the group's. Throw KernelError.
StoredRecord readRecord(int directory);
void writeRecord(int directory, const Record &record);

// Writes the record of a new group, unless another process has written one already. Throws
// KernelError.
void writeFirstRecord(int directory);

}  // namespace Knob::Linux
