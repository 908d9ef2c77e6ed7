// SPDX-License-Identifier: Apache-2.0
// Every call is made the way a program makes it: through the lists and records of the interface.
#include "calls.h"

#include <gtest/gtest.h>

#include <memory>
#include <ostream>
#include <tuple>

#include "platform/knob_records.h"

namespace Contract {
namespace {

struct DestroyList {
  void operator()(KNOB_ParamList *list) const { KNOB_ParamListDestroy(list); }
};
using List = std::unique_ptr<KNOB_ParamList, DestroyList>;

List instance(int64_t id) {
  List list(KNOB_ParamListCreate(1, 1));
  EXPECT_EQ(KNOB_ParamListAddInt(list.get(), id), 0U);
  return list;
}

List input(const Texts &texts) {
  List list(KNOB_ParamListCreate(0, static_cast<int>(texts.size())));
  for (const std::string &text : texts) {
    EXPECT_EQ(KNOB_ParamListAddString(list.get(), text.c_str()), 0U);
  }
  return list;
}

// Reads one record of a group.
template <typename Record>
Answer<Record> get(KNOB_NodeID node, int64_t id) {
  Record record{};
  const auto status = KNOB_Get(node, instance(id).get(), &record, sizeof record);
  return {status, record};
}

template <typename Record>
Answer<Settings> settings(const Answer<Record> &allocation) {
  const Record &record = allocation.value;
  return {allocation.status, {record.min, record.max, record.minLimit, record.shares}};
}

}  // namespace

bool operator==(const Settings &left, const Settings &right) {
  return std::tie(left.min, left.max, left.minLimit, left.shares) ==
         std::tie(right.min, right.max, right.minLimit, right.shares);
}

std::ostream &operator<<(std::ostream &out, const Settings &settings) {
  return out << "{min " << settings.min << ", max " << settings.max << ", minLimit "
             << settings.minLimit << ", shares " << settings.shares << "}";
}

Answer<int64_t> lookUp(const std::string &path) {
  int64_t id = -1;
  const auto status =
      KNOB_Set(KNOB_NODE_sched_groupPathNameToID, nullptr, input({path}).get(), &id, sizeof(id));
  return {status, id};
}

Answer<int64_t> create(int64_t parent, const std::string &name) {
  int64_t id = -1;
  const auto status = KNOB_Set(KNOB_NODE_sched_groups_groupCreate, instance(parent).get(),
                               input({name}).get(), &id, sizeof(id));
  return {status, id};
}

KNOB_ReturnStatus remove(int64_t id) {
  return KNOB_Set(KNOB_NODE_sched_groups_delete, instance(id).get(), nullptr, nullptr, 0);
}

KNOB_ReturnStatus setMemory(int64_t id, const Texts &settings) {
  return KNOB_Set(KNOB_NODE_sched_groups_memAllocationInMB, instance(id).get(),
                  input(settings).get(), nullptr, 0);
}

KNOB_ReturnStatus setCpu(int64_t id, const Texts &settings) {
  return KNOB_Set(KNOB_NODE_sched_groups_cpuAllocationInPct, instance(id).get(),
                  input(settings).get(), nullptr, 0);
}

Answer<Settings> memory(int64_t id) {
  return settings(get<KNOB_MemAllocation>(KNOB_NODE_sched_groups_memAllocationInMB, id));
}

Answer<Settings> cpu(int64_t id) {
  return settings(get<KNOB_CpuAllocation>(KNOB_NODE_sched_groups_cpuAllocationInPct, id));
}

namespace {

// The interface counts the entries of a list that it hands out, and does not show them.
Answer<int> countInstances(KNOB_NodeID node, int64_t id) {
  KNOB_ParamList *result = nullptr;
  const auto status = KNOB_GetInstanceListAlloc(node, instance(id).get(), &result);
  const List owned(result);
  return {status, KNOB_ParamListNumInstances(result)};
}

}  // namespace

Answer<int> countChildGroups(int64_t id) {
  return countInstances(KNOB_NODE_sched_groups_members_groups, id);
}

Answer<int> countMembers(int64_t id) {
  return countInstances(KNOB_NODE_sched_groups_members_worlds, id);
}

KNOB_ReturnStatus join(int64_t id, int64_t pid) {
  const List pids(KNOB_ParamListCreate(0, 1));
  EXPECT_EQ(KNOB_ParamListAddInt(pids.get(), pid), 0U);
  return KNOB_Set(KNOB_NODE_sched_groups_members_worlds, instance(id).get(), pids.get(), nullptr,
                  0);
}

Answer<Peaks> peaks(int64_t id) {
  const auto stats = get<KNOB_MemoryStats>(KNOB_NODE_sched_groups_stats_memoryStats, id);
  return {stats.status, {stats.value.ownReservedPeakKB, stats.value.childrenReservedPeakKB}};
}

int64_t idOf(const std::string &path) {
  const auto found = lookUp(path);
  EXPECT_EQ(found.status, kSuccess) << path;
  return found.value;
}

int64_t newGroup(const std::string &parentPath, const std::string &name) {
  const auto made = create(idOf(parentPath), name);
  EXPECT_EQ(made.status, kSuccess) << parentPath << "/" << name;
  return made.value;
}

}  // namespace Contract
