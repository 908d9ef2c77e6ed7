// SPDX-License-Identifier: Apache-2.0
// Implements the operations on scheduler groups as exchanges over KNOB.
#include "sched/scheduler_group.h"

#include <exception>

#include "platform/knob.h"
#include "platform/knob_status.h"
#include "platform/param_list.h"
#include "sched/exception.h"

namespace Sched {
namespace {

// min, max, minLimit and shares.
constexpr int kSettingCount = 4;

void check(KNOB_ReturnStatus status, const char *call) {
  if (status != 0) throw Exception(call, status);
}

void requireList(const ParamList &list) {
  if (!list) throw Exception("KNOB_ParamListCreate", KNOB_STATUS_OUT_OF_MEMORY);
}

void addInt(const ParamList &list, int64_t value) {
  check(KNOB_ParamListAddInt(list.get(), value), "KNOB_ParamListAddInt");
}

// A text with a NUL would be cut there and name another group.
void addString(const ParamList &list, const std::string &text) {
  const bool whole = text.find('\0') == std::string::npos;
  check(whole ? KNOB_ParamListAddString(list.get(), text.c_str()) : KNOB_STATUS_BAD_PARAMETER,
        "KNOB_ParamListAddString");
}

void addSetting(const ParamList &list, const char *key, int64_t value) {
  addString(list, key + std::to_string(value));
}

void getAllocation(KNOB_NodeID node, int64_t id, void *record, size_t size) {
  const ParamList instance(ParamList::Kind::kInstance, 1);
  requireList(instance);
  addInt(instance, id);
  check(KNOB_Get(node, instance.get(), record, size), "KNOB_Get");
}

// The kernel's record has shares before minLimit; the settings are sent in the opposite order.
template <typename Allocation>
void setAllocation(KNOB_NodeID node, int64_t id, const Allocation &allocation) {
  const ParamList instance(ParamList::Kind::kInstance, 1);
  requireList(instance);
  const ParamList input(ParamList::Kind::kInput, kSettingCount);
  requireList(input);
  addInt(instance, id);
  addSetting(input, "min=", allocation.min);
  addSetting(input, "max=", allocation.max);
  addSetting(input, "minLimit=", allocation.minLimit);
  if (allocation.shares != -1) addSetting(input, "shares=", allocation.shares);
  check(KNOB_Set(node, instance.get(), input.get(), nullptr, 0), "KNOB_Set");
}

struct SplitPath {
  std::string parent, name;
};

// Without a slash the parent is the empty path, which the kernel accepts or refuses.
SplitPath splitAtLastSlash(const std::string &path) {
  const size_t slash = path.rfind('/');
  if (slash == std::string::npos) return {"", path};
  return {path.substr(0, slash), path.substr(slash + 1)};
}

void initializeGroup(int64_t id, const std::string &path, const MemAllocation &mem,
                     const CpuAllocation &cpu) {
  try {
    setMemAllocation(id, mem);
    setCpuAllocation(id, cpu);
  } catch (const Exception &refusal) {
    deleteGroup(id);
    std::throw_with_nested(Exception("Initialize " + path, refusal.status));
  }
}

}  // namespace

int64_t pathNameToId(const std::string &path) {
  const ParamList input(ParamList::Kind::kInput, 1);
  requireList(input);
  addString(input, path);
  int64_t id = 0;
  check(KNOB_Set(KNOB_NODE_sched_groupPathNameToID, nullptr, input.get(), &id, sizeof id),
        "KNOB_Set");
  return id;
}

void getMemAllocation(int64_t id, MemAllocation *allocation) {
  getAllocation(KNOB_NODE_sched_groups_memAllocationInMB, id, allocation, sizeof *allocation);
}

void getCpuAllocation(int64_t id, CpuAllocation *allocation) {
  getAllocation(KNOB_NODE_sched_groups_cpuAllocationInPct, id, allocation, sizeof *allocation);
}

void setMemAllocation(int64_t id, const MemAllocation &allocation) {
  setAllocation(KNOB_NODE_sched_groups_memAllocationInMB, id, allocation);
}

void setCpuAllocation(int64_t id, const CpuAllocation &allocation) {
  setAllocation(KNOB_NODE_sched_groups_cpuAllocationInPct, id, allocation);
}

void deleteGroup(int64_t id) {
  const ParamList instance(ParamList::Kind::kInstance, 1);
  requireList(instance);
  addInt(instance, id);
  check(KNOB_Set(KNOB_NODE_sched_groups_delete, instance.get(), nullptr, nullptr, 0), "KNOB_Set");
}

void createGroup(const std::string &path, const MemAllocation &mem, const CpuAllocation &cpu) {
  const SplitPath split = splitAtLastSlash(path);
  const ParamList instance(ParamList::Kind::kInstance, 1);
  requireList(instance);
  const ParamList input(ParamList::Kind::kInput, 1);
  requireList(input);
  addInt(instance, pathNameToId(split.parent));
  addString(input, split.name);
  int64_t id = 0;
  check(KNOB_Set(KNOB_NODE_sched_groups_groupCreate, instance.get(), input.get(), &id, sizeof id),
        "KNOB_Set");
  initializeGroup(id, path, mem, cpu);
}

}  // namespace Sched
