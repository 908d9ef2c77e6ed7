// SPDX-License-Identifier: Apache-2.0
// A line: ID PARENT MAJOR:MINOR ROOT POINT OPTIONS [OPTIONAL...] - TYPE SOURCE SUPEROPTIONS.
// Blanks and backslashes inside a field are written as three octal digits after a backslash.
#include "knob/linux/mount_info.h"

#include <algorithm>
#include <charconv>
#include <optional>

namespace Knob::Linux {
namespace {

constexpr size_t kIdField = 0, kRootField = 3, kPointField = 4, kOptionsField = 5;
// After the lone "-": type, source, super options.
constexpr size_t kTypeField = 1, kSuperOptionsField = 3;

std::vector<std::string_view> split(std::string_view text, char separator) {
  std::vector<std::string_view> parts;
  for (size_t start = 0; start <= text.size();) {
    const size_t end = std::min(text.find(separator, start), text.size());
    if (end > start) parts.push_back(text.substr(start, end - start));
    start = end + 1;
  }
  return parts;
}

bool isOctal(char c) {
  return c >= '0' && c <= '7';
}

std::string unescaped(std::string_view field) {
  std::string text;
  for (size_t at = 0; at < field.size(); ++at) {
    const std::string_view digits = field.substr(at + 1, 3);
    if (field[at] == '\\' && digits.size() == 3 &&
        std::all_of(digits.begin(), digits.end(), isOctal)) {
      text += static_cast<char>((digits[0] - '0') * 64 + (digits[1] - '0') * 8 + digits[2] - '0');
      at += 3;
    } else {
      text += field[at];
    }
  }
  return text;
}

bool hasOption(std::string_view options, std::string_view option) {
  const auto all = split(options, ',');
  return std::find(all.begin(), all.end(), option) != all.end();
}

std::optional<int> number(std::string_view digits) {
  int value = 0;
  const auto [stop, error] = std::from_chars(digits.data(), digits.data() + digits.size(), value);
  if (error != std::errc() || stop != digits.data() + digits.size()) return std::nullopt;
  return value;
}

void addLine(CgroupMounts &mounts, std::string_view line) {
  const std::vector<std::string_view> fields = split(line, ' ');
  const auto dash = std::find(fields.begin(), fields.end(), "-");
  const auto before = static_cast<size_t>(dash - fields.begin());
  if (before <= kOptionsField || fields.size() - before <= kSuperOptionsField) return;

  const std::string_view type = dash[kTypeField], superOptions = dash[kSuperOptionsField];
  if (type == "cgroup") {
    for (std::string_view option : split(superOptions, ',')) {
      mounts.legacyControllers.emplace_back(option);
    }
  }
  const std::optional<int> id = number(fields[kIdField]);
  if (type != "cgroup2" || !id) return;
  mounts.unified.push_back(
      {*id, unescaped(fields[kRootField]), unescaped(fields[kPointField]),
       hasOption(fields[kOptionsField], "ro") || hasOption(superOptions, "ro")});
}

}  // namespace

CgroupMounts parseMountInfo(std::string_view text) {
  CgroupMounts mounts;
  for (std::string_view line : split(text, '\n')) addLine(mounts, line);
  return mounts;
}

}  // namespace Knob::Linux
