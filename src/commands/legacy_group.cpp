// SPDX-License-Identifier: Apache-2.0
// The exchanges with KNOB of the option mode.
#include "commands/legacy_group.h"

#include <array>
#include <cstdio>
#include <cstring>

#include "platform/param_list.h"

namespace Legacy {
namespace {

constexpr KNOB_ReturnStatus kNoMemory = 0x0BAD0014;

using MemoryAllocationRecord = std::array<char, 36>;
using MemoryStatisticsRecord = std::array<char, 382>;

template <typename Field, typename Record>
Field fieldAt(const Record &record, size_t offset) {
  Field field;
  std::memcpy(&field, record.data() + offset, sizeof field);
  return field;
}

KNOB_ReturnStatus addId(const ParamList &list, int64_t id) {
  return list ? KNOB_ParamListAddInt(list.get(), id) : kNoMemory;
}

KNOB_ReturnStatus addSetting(const ParamList &list, const char *format, int value) {
  std::array<char, 40> text;
  snprintf(text.data(), text.size(), format, value);
  return KNOB_ParamListAddString(list.get(), text.data());
}

}  // namespace

KNOB_ReturnStatus lookUpGroup(const char *path, int64_t *id) {
  const ParamList input(ParamList::Kind::kInput, 1);
  if (!input) return kNoMemory;
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
  MemoryAllocationRecord allocation;
  if (const auto status = KNOB_Get(KNOB_NODE_sched_groups_memAllocationInMB, instance.get(),
                                   allocation.data(), allocation.size())) {
    return status;
  }
  MemoryStatisticsRecord statistics;
  if (const auto status = KNOB_Get(KNOB_NODE_sched_groups_stats_memoryStats, instance.get(),
                                   statistics.data(), statistics.size())) {
    return status;
  }
  report->minMB = fieldAt<int64_t>(allocation, 0);
  report->maxMB = fieldAt<int64_t>(allocation, 8);
  report->ownPeakKB = fieldAt<uint64_t>(statistics, 309);
  report->childrenPeakKB = fieldAt<uint64_t>(statistics, 374);
  return 0;
}

KNOB_ReturnStatus setGroupMemSize(int64_t id, int sizeMB) {
  const ParamList instance(ParamList::Kind::kInstance, 1);
  if (const auto status = addId(instance, id)) return status;
  const ParamList input(ParamList::Kind::kInput, 2);
  if (!input) return kNoMemory;
  if (const auto status = addSetting(input, "min=%d", sizeMB)) return status;
  if (const auto status = addSetting(input, "max=%d", sizeMB)) return status;
  return KNOB_Set(KNOB_NODE_sched_groups_memAllocationInMB, instance.get(), input.get(), nullptr,
                  0);
}

}  // namespace Legacy
