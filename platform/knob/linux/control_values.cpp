// SPDX-License-Identifier: Apache-2.0
// Arithmetic and digits only; no file is touched here.
#include "knob/linux/control_values.h"

#include <algorithm>
#include <array>
#include <charconv>

#include "knob/linux/cpu_weights.h"

namespace Knob::Linux {
namespace {

constexpr uint64_t kMegabyte = uint64_t{1024} * 1024;
// Linux counts pages in a signed long, so a limit is below 2^63 bytes.
constexpr int64_t kMaxMegabytes = (int64_t{1} << 43) - 1;
constexpr int64_t kPeriodMicroseconds = 100000;
constexpr int64_t kMicrosecondsPerPercent = kPeriodMicroseconds / 100;

struct ShareLevel {
  int64_t shares, weight;
};
constexpr std::array kShareLevels = {ShareLevel{-2, 50}, ShareLevel{-3, 100}, ShareLevel{-4, 200}};

std::string_view trimmed(std::string_view text) {
  while (!text.empty() && (text.back() == '\n' || text.back() == ' ')) text.remove_suffix(1);
  return text;
}

}  // namespace

ControlTexts controlTextsFor(Resource resource, const ResourceState &state) {
  const int64_t max = state.allocation.max;
  if (resource == Resource::kCpu) return {{Control::kCpuMax, cpuMaxText(max)}};
  return {{Control::kMemoryMin, memoryText(reservationOf(state))},
          {Control::kMemoryMax, memoryText(max)}};
}

std::string memoryText(int64_t megabytes) {
  if (megabytes < 0 || megabytes > kMaxMegabytes) return "max";
  return std::to_string(static_cast<uint64_t>(megabytes) * kMegabyte);
}

std::string cpuMaxText(int64_t percent) {
  // Every percentage that a call can carry is far below the largest quota of Linux.
  const std::string quota =
      percent < 0 ? "max" : std::to_string(std::max<int64_t>(percent, 1) * kMicrosecondsPerPercent);
  return quota + " " + std::to_string(kPeriodMicroseconds);
}

int64_t weightOfShares(int64_t shares) {
  for (const ShareLevel &level : kShareLevels) {
    if (level.shares == shares) return level.weight;
  }
  return std::clamp(shares / 10, kMinCpuWeight, kMaxCpuWeight);
}

std::optional<uint64_t> parseLimit(std::string_view text) {
  const std::string_view value = trimmed(text);
  if (value == "max") return kUnlimited;
  uint64_t number = 0;
  const auto [stop, error] = std::from_chars(value.data(), value.data() + value.size(), number);
  if (error != std::errc() || stop != value.data() + value.size()) return std::nullopt;
  return number;
}

std::optional<int64_t> parseCpuMax(std::string_view text) {
  const std::string_view value = trimmed(text);
  const size_t blank = value.find(' ');
  if (blank == std::string_view::npos) return std::nullopt;
  const auto quota = parseLimit(value.substr(0, blank));
  const auto period = parseLimit(value.substr(blank + 1));
  if (!quota || !period || *period == 0 || *period == kUnlimited) return std::nullopt;
  if (*quota == kUnlimited) return -1;
  const uint64_t maxQuota = kUnlimited / 100;
  return static_cast<int64_t>(std::min(*quota, maxQuota) * 100 / *period);
}

int64_t minimumMegabytes(uint64_t bytes) {
  return static_cast<int64_t>(bytes / kMegabyte + (bytes % kMegabyte != 0 ? 1 : 0));
}

int64_t maximumMegabytes(uint64_t bytes) {
  return bytes == kUnlimited ? -1 : static_cast<int64_t>(bytes / kMegabyte);
}

int64_t sharesOfWeight(uint64_t weight) {
  const auto known = static_cast<int64_t>(std::min<uint64_t>(weight, kMaxCpuWeight));
  for (const ShareLevel &level : kShareLevels) {
    if (level.weight == known) return level.shares;
  }
  return known * 10;
}

std::optional<uint64_t> keyedValue(std::string_view text, std::string_view key) {
  for (size_t start = 0; start < text.size();) {
    const size_t end = std::min(text.find('\n', start), text.size());
    const std::string_view line = text.substr(start, end - start);
    if (line.size() > key.size() && line.substr(0, key.size()) == key && line[key.size()] == ' ') {
      return parseLimit(line.substr(key.size() + 1));
    }
    start = end + 1;
  }
  return std::nullopt;
}

bool hasWord(std::string_view list, std::string_view word) {
  for (size_t start = 0; start < list.size();) {
    const size_t end = std::min(list.find_first_of(" \n", start), list.size());
    if (list.substr(start, end - start) == word) return true;
    start = end + 1;
  }
  return false;
}

}  // namespace Knob::Linux
