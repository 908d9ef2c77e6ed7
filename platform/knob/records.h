// SPDX-License-Identifier: Apache-2.0
// The records that cross the interface, byte for byte. Every byte that has no name here is written
// as 0.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

namespace Knob {

#pragma pack(push, 1)

struct CpuInfoRecord {
  std::array<uint8_t, 24> reserved0{};
  uint32_t cpus = 0;
  std::array<uint8_t, 8> reserved28{};
  uint8_t isVm = 0;
  uint8_t reserved37 = 0;
};
static_assert(sizeof(CpuInfoRecord) == 38);
static_assert(offsetof(CpuInfoRecord, cpus) == 24);
static_assert(offsetof(CpuInfoRecord, isVm) == 36);

struct VmLimitsRecord {
  uint32_t maxVms = 0;
  std::array<uint8_t, 28> reserved4{};
};
static_assert(sizeof(VmLimitsRecord) == 32);

struct BootCommandLineRecord {
  std::array<char, 4096> text{};  // NUL-terminated, cut to fit
};
static_assert(sizeof(BootCommandLineRecord) == 4096);

struct MemoryRecord {
  uint64_t physicalKB = 0;
  std::array<uint8_t, 72> reserved8{};
};
static_assert(sizeof(MemoryRecord) == 80);

// MB.
struct MemoryAllocationRecord {
  int64_t min = 0, max = 0, shares = 0, minLimit = 0;
  uint32_t reserved32 = 0;
};
static_assert(sizeof(MemoryAllocationRecord) == 36);
static_assert(offsetof(MemoryAllocationRecord, max) == 8);
static_assert(offsetof(MemoryAllocationRecord, shares) == 16);
static_assert(offsetof(MemoryAllocationRecord, minLimit) == 24);

// Percent of one CPU.
struct CpuAllocationRecord {
  int32_t min = 0, max = 0, shares = 0, minLimit = 0;
  uint32_t reserved16 = 0;
};
static_assert(sizeof(CpuAllocationRecord) == 20);
static_assert(offsetof(CpuAllocationRecord, max) == 4);
static_assert(offsetof(CpuAllocationRecord, shares) == 8);
static_assert(offsetof(CpuAllocationRecord, minLimit) == 12);

struct MemoryStatisticsRecord {
  std::array<uint8_t, 309> reserved0{};
  uint64_t ownReservedPeakKB = 0;
  std::array<uint8_t, 57> reserved317{};
  uint64_t childrenReservedPeakKB = 0;
};
static_assert(sizeof(MemoryStatisticsRecord) == 382);
static_assert(offsetof(MemoryStatisticsRecord, ownReservedPeakKB) == 309);
static_assert(offsetof(MemoryStatisticsRecord, childrenReservedPeakKB) == 374);

#pragma pack(pop)

}  // namespace Knob
