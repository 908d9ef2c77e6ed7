// SPDX-License-Identifier: Apache-2.0
// The one list of nodes. Their numbers, the exported objects, the table of node_table.cpp and the
// count come from it: a node is one row here, beside its declaration in knob.h.
#pragma once

#include <cstddef>

#include "platform/knob.h"

// row(name, number, what it does). The name is the one that follows KNOB_NODE_. The number is
// libknob's own: programs pass on what the exported object holds. A running kernel keeps working
// with libraries that know the same names and numbers.
// clang-format off
#define KNOB_NODE_LIST(row)                                                                       \
  row(hardware_cpu_cpuInfo, 0x0101, machineNode().gets<KNOB_CpuInfo>(getCpuInfo))                 \
  row(system_vmLimits, 0x0102, machineNode().gets<KNOB_VmLimits>(getVmLimits))                    \
  row(system_bootCmdLine, 0x0103,                                                                 \
      machineNode().gets<KNOB_BootCommandLine>(getBootCommandLine))                               \
  row(memory_comprehensive, 0x0104, machineNode().gets<KNOB_MemoryInfo>(getMemory))               \
  row(sched_groupPathNameToID, 0x0201,                                                            \
      machineNode().sets(InputShape::kOneText, lookUp).returns<GroupId>())                        \
  row(sched_groups_groupCreate, 0x0202,                                                           \
      groupNode().sets(InputShape::kOneText, create).returns<GroupId>())                          \
  row(sched_groups_delete, 0x0203, groupNode().sets(InputShape::kNothing, remove))                \
  row(sched_groups_memAllocationInMB, 0x0204,                                                     \
      groupNode()                                                                                 \
          .gets<KNOB_MemAllocation>(getMemoryAllocation)                                          \
          .sets(InputShape::kSettings, setAllocation<Resource::kMemory>))                         \
  row(sched_groups_cpuAllocationInPct, 0x0205,                                                    \
      groupNode()                                                                                 \
          .gets<KNOB_CpuAllocation>(getCpuAllocation)                                             \
          .sets(InputShape::kSettings, setAllocation<Resource::kCpu>))                            \
  row(sched_groups_members_groups, 0x0206, groupNode().lists(listGroups))                         \
  row(sched_groups_members_worlds, 0x0207,                                                        \
      groupNode().sets(InputShape::kOneInt, join).lists(listMembers))                             \
  row(sched_groups_stats_memoryStats, 0x0208,                                                     \
      groupNode().gets<KNOB_MemoryStats>(getMemoryStatistics))
// clang-format on

namespace Knob {

// The numbers by name, such as NodeIds::sched_groups_delete.
namespace NodeIds {
#define KNOB_NODE_NUMBER(name, number, node) inline constexpr KNOB_NodeID name = number;
KNOB_NODE_LIST(KNOB_NODE_NUMBER)
#undef KNOB_NODE_NUMBER
}  // namespace NodeIds

#define KNOB_NODE_COUNT(name, number, node) +1
inline constexpr size_t kNodeCount = 0 KNOB_NODE_LIST(KNOB_NODE_COUNT);
#undef KNOB_NODE_COUNT

}  // namespace Knob
