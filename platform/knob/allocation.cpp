// SPDX-License-Identifier: Apache-2.0
// Everything here looks at one allocation alone. Whether the rest of the tree has room for it is
// the business of admission.
#include "knob/allocation.h"

#include <array>
#include <charconv>
#include <limits>
#include <string>

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
  refuse(entry, "no setting of that name");
}

int64_t numberOf(Resource resource, std::string_view digits, std::string_view entry) {
  int64_t number = 0;
  const char *end = digits.data() + digits.size();
  const auto [stop, error] = std::from_chars(digits.data(), end, number);
  if (error != std::errc() || stop != end) refuse(entry, "no decimal number");
  if (resource == Resource::kCpu && (number < std::numeric_limits<int32_t>::min() ||
                                     number > std::numeric_limits<int32_t>::max())) {
    refuse(entry, "number out of range");
  }
  return number;
}

void check(bool good, const char *why) {
  if (!good) throw KernelError(Status::kBadParameter, why);
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

  check(wanted.min >= 0, "min is negative");
  check(wanted.max >= -1, "max is negative");
  check(wanted.minLimit >= -1, "minLimit is negative");
  check(wanted.shares >= 0 || (wanted.shares >= kHighShares && wanted.shares <= kLowShares),
        "shares are negative and no level");
  check(wanted.max == -1 || wanted.min <= wanted.max, "min is above max");
  return wanted;
}

}  // namespace Knob
