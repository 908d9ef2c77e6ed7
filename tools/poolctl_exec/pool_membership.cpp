// SPDX-License-Identifier: Apache-2.0
#include "pool_membership.h"

#include <unistd.h>

#include <array>
#include <cstdint>
#include <cstring>
#include <stdexcept>

#include "platform/knob.h"
#include "platform/param_list.h"

namespace Exec {
namespace {

constexpr KNOB_ReturnStatus kNotFound = 0x0BAD0003;
constexpr KNOB_ReturnStatus kBusy = 0x0BAD0004;
constexpr KNOB_ReturnStatus kOutOfMemory = 0x0BAD0014;

[[noreturn]] void refuse(const std::string &path, const char *reason) {
  throw std::runtime_error(path + ": " + reason);
}

int64_t lookUp(const std::string &path) {
  const ParamList input(ParamList::Kind::kInput, 1);
  KNOB_ReturnStatus status = KNOB_ParamListAddString(input.get(), path.c_str());
  int64_t id = -1;
  if (status == 0) {
    status = KNOB_Set(KNOB_NODE_sched_groupPathNameToID, nullptr, input.get(), &id, sizeof id);
  }
  if (status == kNotFound) refuse(path, "no such pool is loaded");
  if (status != 0) refuse(path, NUC_ReturnStatusToString(status));
  return id;
}

int64_t memoryMaxMB(const std::string &path) {
  constexpr size_t kRecordSize = 36, kMaxOffset = 8;
  const int64_t id = lookUp(path);
  const ParamList instance(ParamList::Kind::kInstance, 1);
  KNOB_ReturnStatus status = KNOB_ParamListAddInt(instance.get(), id);
  std::array<char, kRecordSize> record{};
  if (status == 0) {
    status = KNOB_Get(KNOB_NODE_sched_groups_memAllocationInMB, instance.get(), record.data(),
                      record.size());
  }
  if (status != 0) refuse(path, NUC_ReturnStatusToString(status));
  int64_t max = 0;
  std::memcpy(&max, record.data() + kMaxOffset, sizeof max);
  return max;
}

// Throws, naming the group that has no memory. Returns if it has been enabled meanwhile.
void refuseDisabled(const std::string &path) {
  for (size_t end = path.find('/'); end != std::string::npos; end = path.find('/', end + 1)) {
    const std::string above = path.substr(0, end);
    if (memoryMaxMB(above) == 0) refuse(path, ("disabled: " + above + " has no memory").c_str());
  }
  if (memoryMaxMB(path) == 0) refuse(path, "the pool is disabled");
}

}  // namespace

std::string groupPath(const std::string &pool) {
  return pool.compare(0, 5, "host/") == 0 ? pool : "host/opt/" + pool;
}

void joinGroup(const std::string &path) {
  const int64_t id = lookUp(path);
  const ParamList instance(ParamList::Kind::kInstance, 1);
  const ParamList input(ParamList::Kind::kInput, 1);
  KNOB_ReturnStatus status = KNOB_ParamListAddInt(instance.get(), id);
  if (status == 0) status = KNOB_ParamListAddInt(input.get(), getpid());
  if (status == 0) {
    status =
        KNOB_Set(KNOB_NODE_sched_groups_members_worlds, instance.get(), input.get(), nullptr, 0);
  }
  if (status == kNotFound) refuse(path, "the pool has just been unloaded");
  if (status == kBusy) refuse(path, "the pool has pools below it, so it takes no processes itself");
  if (status == kOutOfMemory) refuseDisabled(path);
  if (status != 0) refuse(path, NUC_ReturnStatusToString(status));
}

}  // namespace Exec
