// SPDX-License-Identifier: Apache-2.0
#include "pool_membership.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <stdexcept>
#include <system_error>

#include "platform/knob.h"
#include "platform/knob_records.h"
#include "platform/knob_status.h"
#include "platform/param_list.h"

namespace Exec {
namespace {

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
  if (status == KNOB_STATUS_NOT_FOUND) refuse(path, "no such pool is loaded");
  if (status != 0) refuse(path, NUC_ReturnStatusToString(status));
  return id;
}

int64_t memoryMaxMB(const std::string &path) {
  const int64_t id = lookUp(path);
  const ParamList instance(ParamList::Kind::kInstance, 1);
  KNOB_ReturnStatus status = KNOB_ParamListAddInt(instance.get(), id);
  KNOB_MemAllocation allocation{};
  if (status == 0) {
    status = KNOB_Get(KNOB_NODE_sched_groups_memAllocationInMB, instance.get(), &allocation,
                      sizeof allocation);
  }
  if (status != 0) refuse(path, NUC_ReturnStatusToString(status));
  return allocation.max;
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
  if (status == KNOB_STATUS_NOT_FOUND) refuse(path, "the pool has just been unloaded");
  if (status == KNOB_STATUS_BUSY)
    refuse(path, "the pool has pools below it, so it takes no processes itself");
  if (status == KNOB_STATUS_OUT_OF_MEMORY) refuseDisabled(path);
  if (status != 0) refuse(path, NUC_ReturnStatusToString(status));
}

void setOomScoreAdj(int value) {
  constexpr const char *kFile = "/proc/self/oom_score_adj";
  const std::string text = std::to_string(value);
  const int file = open(kFile, O_WRONLY | O_CLOEXEC);
  const ssize_t count = file < 0 ? -1 : write(file, text.data(), text.size());
  const int error = errno;
  if (file >= 0) (void)close(file);  // the write has been reported already
  if (count < 0) {
    throw std::system_error(error, std::generic_category(), std::string(kFile) + ": " + text);
  }
}

}  // namespace Exec
