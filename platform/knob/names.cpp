// SPDX-License-Identifier: Apache-2.0
// Names and paths as plain bytes; whether a group of that name exists is the kernel's knowledge.
#include "knob/names.h"

#include <algorithm>
#include <array>

namespace Knob {
namespace {

constexpr size_t kMaxNameBytes = 255;

// "cgroup" and every controller of Linux. Any of them can begin a file of a group's directory,
// whether or not this machine has the controller.
constexpr std::array<std::string_view, 13> kControlFilePrefixes = {
    "cgroup.", "cpu.",  "cpuset.", "debug.",      "dmem.", "hugetlb.", "io.",
    "irq.",    "misc.", "memory.", "perf_event.", "pids.", "rdma."};

bool beginsLikeControlFile(std::string_view name) {
  return std::any_of(
      kControlFilePrefixes.begin(), kControlFilePrefixes.end(),
      [name](std::string_view prefix) { return name.substr(0, prefix.size()) == prefix; });
}

}  // namespace

bool isGroupName(std::string_view name) {
  constexpr std::string_view kForbidden("/\0\n", 3);
  if (name.empty() || name.size() > kMaxNameBytes) return false;
  if (name == "." || name == "..") return false;
  if (name.find_first_of(kForbidden) != std::string_view::npos) return false;
  return !beginsLikeControlFile(name);
}

std::optional<std::vector<std::string_view>> splitPath(std::string_view path) {
  std::vector<std::string_view> components;
  for (size_t start = 0;;) {
    const size_t end = path.find('/', start);
    const std::string_view component = path.substr(start, end - start);
    if (!isGroupName(component)) return std::nullopt;
    components.push_back(component);
    if (end == std::string_view::npos) return components;
    start = end + 1;
  }
}

}  // namespace Knob
