// SPDX-License-Identifier: Apache-2.0
// libknob called as any program calls it, for what poolctl would never ask. Each answers the
// status.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "platform/knob.h"
#include "platform/knob_status.h"
#include "platform/param_list.h"

namespace Uml {

constexpr KNOB_ReturnStatus kNotFound = KNOB_STATUS_NOT_FOUND;
constexpr KNOB_ReturnStatus kBusy = KNOB_STATUS_BUSY;
constexpr KNOB_ReturnStatus kExists = KNOB_STATUS_EXISTS;
constexpr KNOB_ReturnStatus kBadParameter = KNOB_STATUS_BAD_PARAMETER;

inline KNOB_ReturnStatus lookUp(const std::string &path, int64_t *id) {
  const ParamList input(ParamList::Kind::kInput, 1);
  KNOB_ParamListAddString(input.get(), path.c_str());
  return KNOB_Set(KNOB_NODE_sched_groupPathNameToID, nullptr, input.get(), id, sizeof *id);
}

inline KNOB_ReturnStatus create(int64_t parent, const std::string &name, int64_t *id) {
  const ParamList instance(ParamList::Kind::kInstance, 1);
  const ParamList input(ParamList::Kind::kInput, 1);
  KNOB_ParamListAddInt(instance.get(), parent);
  KNOB_ParamListAddString(input.get(), name.c_str());
  return KNOB_Set(KNOB_NODE_sched_groups_groupCreate, instance.get(), input.get(), id, sizeof *id);
}

inline KNOB_ReturnStatus destroy(int64_t group) {
  const ParamList instance(ParamList::Kind::kInstance, 1);
  KNOB_ParamListAddInt(instance.get(), group);
  return KNOB_Set(KNOB_NODE_sched_groups_delete, instance.get(), nullptr, nullptr, 0);
}

inline KNOB_ReturnStatus setMemory(int64_t group, const std::vector<std::string> &entries) {
  const ParamList instance(ParamList::Kind::kInstance, 1);
  const ParamList input(ParamList::Kind::kInput, static_cast<int>(entries.size()));
  KNOB_ParamListAddInt(instance.get(), group);
  for (const std::string &entry : entries) KNOB_ParamListAddString(input.get(), entry.c_str());
  return KNOB_Set(KNOB_NODE_sched_groups_memAllocationInMB, instance.get(), input.get(), nullptr,
                  0);
}

inline KNOB_ReturnStatus join(int64_t group, int64_t pid) {
  const ParamList instance(ParamList::Kind::kInstance, 1);
  const ParamList input(ParamList::Kind::kInput, 1);
  KNOB_ParamListAddInt(instance.get(), group);
  KNOB_ParamListAddInt(input.get(), pid);
  return KNOB_Set(KNOB_NODE_sched_groups_members_worlds, instance.get(), input.get(), nullptr, 0);
}

inline KNOB_ReturnStatus countChildren(int64_t group, int *count) {
  const ParamList instance(ParamList::Kind::kInstance, 1);
  KNOB_ParamListAddInt(instance.get(), group);
  KNOB_ParamList *result = nullptr;
  const KNOB_ReturnStatus status =
      KNOB_GetInstanceListAlloc(KNOB_NODE_sched_groups_members_groups, instance.get(), &result);
  const ParamList children(result);
  if (status == 0) *count = KNOB_ParamListNumInstances(children.get());
  return status;
}

}  // namespace Uml
