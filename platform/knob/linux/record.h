// SPDX-License-Identifier: Apache-2.0
// What Linux has no file for: the record of a group, kept in one extended attribute of its
// directory, so that it goes when the group goes. A group without one was never set by us.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "knob/admission.h"
#include "knob/kernel.h"

namespace Knob::Linux {

inline constexpr const char *kRecordAttribute = "user.knob";
// Of host alone: the library that made it, "MD5 BUILDDATE".
inline constexpr const char *kLibraryAttribute = "user.knob.library";

struct Record {
  ResourceState memory, cpu;
  MemoryStatistics peaks;
  // The text of memory.high while it is lowered to make a smaller maximum possible: bytes, or
  // kUnlimited. Whoever finds it there puts it back: the one who lowered it has died.
  std::optional<uint64_t> savedHigh;

  ResourceState &state(Resource resource) { return resource == Resource::kMemory ? memory : cpu; }
  const ResourceState &state(Resource resource) const {
    return resource == Resource::kMemory ? memory : cpu;
  }
};

inline constexpr size_t kRecordSize = 112;
using RecordBytes = std::array<char, kRecordSize>;

RecordBytes encode(const Record &record);

// Nothing: another version, another size, or values that no operation leaves behind.
std::optional<Record> decode(std::string_view bytes);

}  // namespace Knob::Linux
