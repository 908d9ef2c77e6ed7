// SPDX-License-Identifier: Apache-2.0
// libknob's calls as the cases write them: lists are made and destroyed here, answers are values.
#pragma once

#include <cstdint>
#include <ostream>
#include <string>
#include <vector>

#include "platform/knob.h"
#include "platform/knob_status.h"

namespace Contract {

// Short names for the cases.
inline constexpr KNOB_ReturnStatus kSuccess = KNOB_STATUS_SUCCESS;
inline constexpr KNOB_ReturnStatus kNotFound = KNOB_STATUS_NOT_FOUND;
inline constexpr KNOB_ReturnStatus kBusy = KNOB_STATUS_BUSY;
inline constexpr KNOB_ReturnStatus kExists = KNOB_STATUS_EXISTS;
inline constexpr KNOB_ReturnStatus kBadParameter = KNOB_STATUS_BAD_PARAMETER;
inline constexpr KNOB_ReturnStatus kOutOfMemory = KNOB_STATUS_OUT_OF_MEMORY;
inline constexpr KNOB_ReturnStatus kPermissionDenied = KNOB_STATUS_PERMISSION_DENIED;
inline constexpr KNOB_ReturnStatus kMemoryBusy = KNOB_STATUS_MEMORY_BUSY;
inline constexpr KNOB_ReturnStatus kReservationRefused = KNOB_STATUS_RESERVATION_REFUSED;

template <typename T>
struct Answer {
  KNOB_ReturnStatus status;
  T value;
};

struct Settings {
  int64_t min, max, minLimit, shares;
};
bool operator==(const Settings &left, const Settings &right);
std::ostream &operator<<(std::ostream &out, const Settings &settings);

inline constexpr Settings kNewGroup{0, -1, -1, -3};

using Texts = std::vector<std::string>;

Answer<int64_t> lookUp(const std::string &path);
Answer<int64_t> create(int64_t parent, const std::string &name);
KNOB_ReturnStatus remove(int64_t id);
KNOB_ReturnStatus setMemory(int64_t id, const Texts &settings);
KNOB_ReturnStatus setCpu(int64_t id, const Texts &settings);
Answer<Settings> memory(int64_t id);
Answer<Settings> cpu(int64_t id);
Answer<int> countChildGroups(int64_t id);
Answer<int> countMembers(int64_t id);
KNOB_ReturnStatus join(int64_t id, int64_t pid);

struct Peaks {
  uint64_t ownKB, childrenKB;
};
Answer<Peaks> peaks(int64_t id);

// The same for a path whose group must exist, and for a group that must be possible.
int64_t idOf(const std::string &path);
int64_t newGroup(const std::string &parentPath, const std::string &name);

}  // namespace Contract
