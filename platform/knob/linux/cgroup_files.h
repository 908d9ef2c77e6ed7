// SPDX-License-Identifier: Apache-2.0
// The files and attributes of a cgroup directory: reading and writing whole ones, and the one place
// that turns an errno into a status.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "knob/kernel.h"

namespace Knob::Linux {

// The files that hold a group's allocations.
enum class Control { kMemoryMin, kMemoryMax, kCpuMax, kCpuWeight };

struct ControlInfo {
  const char *name;
  const char *initialText;  // in a new group
};
inline constexpr std::array kControls = {
    ControlInfo{"memory.min", "0"}, ControlInfo{"memory.max", "max"},
    ControlInfo{"cpu.max", "max 100000"}, ControlInfo{"cpu.weight", "100"}};

constexpr const ControlInfo &infoOf(Control control) {
  return kControls[static_cast<size_t>(control)];
}

inline constexpr const char *kControllersFile = "cgroup.controllers";
inline constexpr const char *kEventsFile = "cgroup.events";
inline constexpr const char *kMembersFile = "cgroup.procs";
inline constexpr const char *kSubtreeFile = "cgroup.subtree_control";
inline constexpr const char *kCpuStatFile = "cpu.stat";
inline constexpr const char *kMemoryCurrentFile = "memory.current";
inline constexpr const char *kMemoryHighFile = "memory.high";
inline constexpr const char *kMemoryReclaimFile = "memory.reclaim";

// An unexpected errno is a failure, never a success.
Status statusOf(int error) noexcept;

// Throws the KernelError of an errno: "WHAT: system's text".
[[noreturn]] void fail(int error, const std::string &what);

// The same with another status than that of the errno.
[[noreturn]] void fail(Status status, int error, const std::string &what);

[[noreturn]] void noSuchGroup();

// Opens the file, writes the text in one call, closes. Never creates or truncates; a short write is
// EIO. Returns 0 or the errno.
int writeControl(int directory, const char *name, std::string_view text);

// The text without the line feed at its end. Throws KernelError.
std::string readControl(int directory, const char *name);

// The same; nothing when there is no such file, because its controller is not enabled or the kernel
// is older.
std::optional<std::string> readControlIfAny(int directory, const char *name);

bool hasControl(int directory, const char *name);

struct Child {
  GroupId id;
  std::string name;
};

// The child groups. One that is deleted meanwhile hides no other. Throws KernelError.
std::vector<Child> readChildren(int directory);

// The living processes of the group itself, without those of another pid namespace. Throws
// KernelError.
std::vector<int64_t> readMembers(int directory);

// The process ids in the text of cgroup.procs, one a line.
std::vector<int64_t> parseMembers(std::string_view text);

// An extended attribute of the directory; nothing when it has none. Throws KernelError.
std::optional<std::string> readAttribute(int directory, const char *name);

// Throw KernelError; for kNew: exists, when the directory has the attribute already.
enum class Attribute { kAny, kNew };
void writeAttribute(int directory, const char *name, std::string_view value,
                    Attribute kind = Attribute::kAny);
void removeAttribute(int directory, const char *name);

}  // namespace Knob::Linux
