/* SPDX-License-Identifier: Apache-2.0 */
/* The records that KNOB_Get writes, byte for byte: packed, in the machine's byte order. The kernel
   writes 0 into every byte that is named `reserved`, and programs do not read those. */
#ifndef POOLCTL_PLATFORM_KNOB_RECORDS_H
#define POOLCTL_PLATFORM_KNOB_RECORDS_H

#include <stddef.h>
#include <stdint.h>

#pragma pack(push, 1)

/* KNOB_NODE_hardware_cpu_cpuInfo */
typedef struct KNOB_CpuInfo {
  uint8_t reserved0[24];
  uint32_t cpus;
  uint8_t reserved28[8];
  uint8_t isVm; /* 1: the machine is itself a virtual one; 0: it is not */
  uint8_t reserved37;
} KNOB_CpuInfo;

/* KNOB_NODE_system_vmLimits */
typedef struct KNOB_VmLimits {
  uint32_t maxVms;
  uint8_t reserved4[28];
} KNOB_VmLimits;

/* KNOB_NODE_system_bootCmdLine */
typedef struct KNOB_BootCommandLine {
  char text[4096]; /* NUL-terminated, cut to fit */
} KNOB_BootCommandLine;

/* KNOB_NODE_memory_comprehensive */
typedef struct KNOB_MemoryInfo {
  uint64_t physicalKB;
  uint8_t reserved8[72];
} KNOB_MemoryInfo;

/* KNOB_NODE_sched_groups_memAllocationInMB: megabytes. -1 in max and minLimit: no limit. shares: -2
   low, -3 normal, -4 high, or a number from 0 up. */
typedef struct KNOB_MemAllocation {
  int64_t min;
  int64_t max;
  int64_t shares;
  int64_t minLimit;
  uint32_t reserved32;
} KNOB_MemAllocation;

/* KNOB_NODE_sched_groups_cpuAllocationInPct: percent of one CPU, with the same special values. */
typedef struct KNOB_CpuAllocation {
  int32_t min;
  int32_t max;
  int32_t shares;
  int32_t minLimit;
  uint32_t reserved16;
} KNOB_CpuAllocation;

/* KNOB_NODE_sched_groups_stats_memoryStats: the highest reservations of the group's life, in KB. */
typedef struct KNOB_MemoryStats {
  uint8_t reserved0[309];
  uint64_t ownReservedPeakKB; /* of the group's own min */
  uint8_t reserved317[57];
  uint64_t childrenReservedPeakKB; /* of the sum of its children's reservations */
} KNOB_MemoryStats;

#pragma pack(pop)

/* libknob checks the layout for programs in C99, which has no static_assert. */
#ifdef __cplusplus

static_assert(sizeof(KNOB_CpuInfo) == 38);
static_assert(offsetof(KNOB_CpuInfo, reserved0) == 0);
static_assert(offsetof(KNOB_CpuInfo, cpus) == 24);
static_assert(offsetof(KNOB_CpuInfo, reserved28) == 28);
static_assert(offsetof(KNOB_CpuInfo, isVm) == 36);
static_assert(offsetof(KNOB_CpuInfo, reserved37) == 37);

static_assert(sizeof(KNOB_VmLimits) == 32);
static_assert(offsetof(KNOB_VmLimits, maxVms) == 0);
static_assert(offsetof(KNOB_VmLimits, reserved4) == 4);

static_assert(sizeof(KNOB_BootCommandLine) == 4096);
static_assert(offsetof(KNOB_BootCommandLine, text) == 0);

static_assert(sizeof(KNOB_MemoryInfo) == 80);
static_assert(offsetof(KNOB_MemoryInfo, physicalKB) == 0);
static_assert(offsetof(KNOB_MemoryInfo, reserved8) == 8);

static_assert(sizeof(KNOB_MemAllocation) == 36);
static_assert(offsetof(KNOB_MemAllocation, min) == 0);
static_assert(offsetof(KNOB_MemAllocation, max) == 8);
static_assert(offsetof(KNOB_MemAllocation, shares) == 16);
static_assert(offsetof(KNOB_MemAllocation, minLimit) == 24);
static_assert(offsetof(KNOB_MemAllocation, reserved32) == 32);

static_assert(sizeof(KNOB_CpuAllocation) == 20);
static_assert(offsetof(KNOB_CpuAllocation, min) == 0);
static_assert(offsetof(KNOB_CpuAllocation, max) == 4);
static_assert(offsetof(KNOB_CpuAllocation, shares) == 8);
static_assert(offsetof(KNOB_CpuAllocation, minLimit) == 12);
static_assert(offsetof(KNOB_CpuAllocation, reserved16) == 16);

static_assert(sizeof(KNOB_MemoryStats) == 382);
static_assert(offsetof(KNOB_MemoryStats, reserved0) == 0);
static_assert(offsetof(KNOB_MemoryStats, ownReservedPeakKB) == 309);
static_assert(offsetof(KNOB_MemoryStats, reserved317) == 317);
static_assert(offsetof(KNOB_MemoryStats, childrenReservedPeakKB) == 374);

#endif

#endif
