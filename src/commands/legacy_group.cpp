// SPDX-License-Identifier: Apache-2.0
// The exchanges with KNOB of the option mode.
#include "commands/legacy_group.h"

#include <array>
#include <cstdio>

#include "platform/knob_records.h"
#include "platform/knob_status.h"
#include "platform/param_list.h"

namespace Legacy {
namespace {

KNOB_ReturnStatus addId(const ParamList &list, int64_t id) {
  if (!list) return KNOB_STATUS_OUT_OF_MEMORY;
  return KNOB_ParamListAddInt(list.get(), id);
}

KNOB_ReturnStatus addSetting(const ParamList &list, const char *format, int value) {
  std::array<char, 40> text;
  snprintf(text.data(), text.size(), format, value);
  return KNOB_ParamListAddString(list.get(), text.data());
}

}  // namespace

KNOB_ReturnStatus lookUpGroup(const char *path, int64_t *id) {
  const ParamList input(ParamList::Kind::kInput, 1);
  if (!input) return KNOB_STATUS_OUT_OF_MEMORY;
  if (const auto status = KNOB_ParamListAddString(input.get(), path)) return status;
  return KNOB_Set(KNOB_NODE_sched_groupPathNameToID, nullptr, input.get(), id, sizeof *id);
}

KNOB_ReturnStatus countMemberGroups(int64_t id, int *count) {
  const ParamList instance(ParamList::Kind::kInstance, 1);
  if (const auto status = addId(instance, id)) return status;
  KNOB_ParamList *members = nullptr;
  if (const auto status = KNOB_GetInstanceListAlloc(KNOB_NODE_sched_groups_members_groups,
                                                    instance.get(), &members)) {
    return status;
  }
  const ParamList owner(members);
  *count = KNOB_ParamListNumInstances(members);
  return 0;
}

KNOB_ReturnStatus readMemoryReport(int64_t id, MemoryReport *report) {
  const ParamList instance(ParamList::Kind::kInstance, 1);
  if (const auto status = addId(instance, id)) return status;
  KNOB_MemAllocation allocation;
  if (const auto status = KNOB_Get(KNOB_NODE_sched_groups_memAllocationInMB, instance.get(),
                                   &allocation, sizeof allocation)) {
    return status;
  }
  KNOB_MemoryStats statistics;
  if (const auto status = KNOB_Get(KNOB_NODE_sched_groups_stats_memoryStats, instance.get(),
                                   &statistics, sizeof statistics)) {
    return status;
  }
  report->minMB = allocation.min;
  report->maxMB = allocation.max;
  report->ownPeakKB = statistics.ownReservedPeakKB;
  report->childrenPeakKB = statistics.childrenReservedPeakKB;
  return 0;
}

KNOB_ReturnStatus setGroupMemSize(int64_t id, int sizeMB) {
  const ParamList instance(ParamList::Kind::kInstance, 1);
  if (const auto status = addId(instance, id)) return status;
  const ParamList input(ParamList::Kind::kInput, 2);
  if (!input) return KNOB_STATUS_OUT_OF_MEMORY;
  if (const auto status = addSetting(input, "min=%d", sizeMB)) return status;
  if (const auto status = addSetting(input, "max=%d", sizeMB)) return status;
  return KNOB_Set(KNOB_NODE_sched_groups_memAllocationInMB, instance.get(), input.get(), nullptr,
                  0);
}

}  // namespace Legacy
