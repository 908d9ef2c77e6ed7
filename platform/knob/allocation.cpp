// SPDX-License-Identifier: Apache-2.0
// Everything here looks at one allocation alone. Admission decides whether the rest of the tree has
// room for it.
#include "knob/allocation.h"

#include <array>
#include <string>

#include "common/number.h"

namespace Knob {
namespace {

constexpr int64_t kHighShares = -4;
constexpr int64_t kLowShares = -2;

struct Setting {
  std::string_view key;
  std::optional<int64_t> AllocationChange::*field;
};

constexpr std::array kSettings = {
    Setting{"min", &AllocationChange::min},
    Setting{"max", &AllocationChange::max},
    Setting{"minLimit", &AllocationChange::minLimit},
    Setting{"shares", &AllocationChange::shares},
};

[[noreturn]] void refuse(std::string_view what, const char *why) {
  throw KernelError(Status::kBadParameter, "\"" + std::string(what) + "\": " + why);
}

const Setting &settingOf(std::string_view key, std::string_view entry) {
  for (const Setting &setting : kSettings) {
    if (setting.key == key) return setting;
  }
  refuse(entry, "not a setting (min, max, minLimit, shares)");
}

int64_t numberOf(Resource resource, std::string_view digits, std::string_view entry) {
  const auto number = resource == Resource::kCpu
                          ? std::optional<int64_t>(Platform::parseNumber<int32_t>(digits))
                          : Platform::parseNumber<int64_t>(digits);
  if (!number) {
    refuse(entry, resource == Resource::kCpu ? "not a decimal number of 32 bits"
                                             : "not a decimal number of 64 bits");
  }
  return *number;
}

void check(bool good, const std::string &why) {
  if (!good) throw KernelError(Status::kBadParameter, why);
}

std::string negative(const char *name, int64_t value) {
  return name + (" " + std::to_string(value)) + " is negative";
}

}  // namespace

AllocationChange parseAllocationChange(Resource resource,
                                       const std::vector<std::string_view> &entries) {
  check(!entries.empty(), "no setting given");
  AllocationChange change;
  for (std::string_view entry : entries) {
    const size_t equals = entry.find('=');
    if (equals == std::string_view::npos) refuse(entry, "no '='");
    std::optional<int64_t> &field = change.*settingOf(entry.substr(0, equals), entry).field;
    if (field) refuse(entry, "given twice");
    field = numberOf(resource, entry.substr(equals + 1), entry);
  }
  return change;
}

Allocation changedAllocation(const Allocation &current, const AllocationChange &change) {
  Allocation wanted = current;
  if (change.min) wanted.min = *change.min == -1 ? 0 : *change.min;
  if (change.max) wanted.max = *change.max;
  if (change.minLimit) wanted.minLimit = *change.minLimit;
  if (change.shares) wanted.shares = *change.shares;

  check(wanted.min >= 0, negative("min", wanted.min));
  check(wanted.max >= -1, negative("max", wanted.max));
  check(wanted.minLimit >= -1, negative("minLimit", wanted.minLimit));
  check(wanted.shares >= 0 || (wanted.shares >= kHighShares && wanted.shares <= kLowShares),
        "shares " + std::to_string(wanted.shares) + " are neither -2, -3, -4 nor 0 and up");
  check(wanted.max == -1 || wanted.min <= wanted.max,
        "min " + std::to_string(wanted.min) + " is above max " + std::to_string(wanted.max));
  return wanted;
}

}  // namespace Knob
