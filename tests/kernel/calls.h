// SPDX-License-Identifier: Apache-2.0
// libknob's calls as the cases write them: lists are made and destroyed here, answers are values.
#pragma once

#include <cstdint>
#include <ostream>
#include <string>
#include <vector>

#include "platform/knob.h"

namespace Contract {

// The statuses that the contract fixes, and those of this library.
inline constexpr KNOB_ReturnStatus kSuccess = 0;
inline constexpr KNOB_ReturnStatus kNotFound = 0x0BAD0003;
inline constexpr KNOB_ReturnStatus kBusy = 0x0BAD0004;
inline constexpr KNOB_ReturnStatus kExists = 0x0BAD0005;
inline constexpr KNOB_ReturnStatus kBadParameter = 0x0BAD0007;
inline constexpr KNOB_ReturnStatus kOutOfMemory = 0x0BAD0014;
inline constexpr KNOB_ReturnStatus kPermissionDenied = 0x0BAD0043;
inline constexpr KNOB_ReturnStatus kMemoryBusy = 0x0BAD0080;
inline constexpr KNOB_ReturnStatus kReservationRefused = 0x0BAD0081;

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
