// SPDX-License-Identifier: Apache-2.0
// The files of a group's directory, and the directory's attributes: reading and writing whole, with
// errno never lost.
#pragma once

#include <array>
#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

#include "common/unique_fd.h"

namespace Knob::Linux {

// The files that a change of settings writes.
enum class Control { kMemoryMin, kMemoryMax, kCpuMax, kCpuWeight };

// name: as Linux has it; fresh: what it holds in a group just made.
struct ControlRow {
  const char *name;
  const char *fresh;
};
inline constexpr std::array kControls = {
    ControlRow{"memory.min", "0"}, ControlRow{"memory.max", "max"},
    ControlRow{"cpu.max", "max 100000"}, ControlRow{"cpu.weight", "100"}};

constexpr const ControlRow &rowOf(Control control) {
  return kControls[static_cast<size_t>(control)];
}

// The files that are looked at, or written on rarer occasions.
inline constexpr const char *kControllersFile = "cgroup.controllers";
inline constexpr const char *kEventsFile = "cgroup.events";
inline constexpr const char *kMembersFile = "cgroup.procs";
inline constexpr const char *kSubtreeFile = "cgroup.subtree_control";
inline constexpr const char *kCpuStatFile = "cpu.stat";
inline constexpr const char *kMemoryCurrentFile = "memory.current";
inline constexpr const char *kMemoryHighFile = "memory.high";
inline constexpr const char *kMemoryReclaimFile = "memory.reclaim";

// 0, or the errno. An opened descriptor stays the caller's.
int openForWriting(int directory, const char *name, Platform::UniqueFd &file);

// One write of the whole text; a short one is EIO. 0, or the errno.
int writeWhole(int file, std::string_view text);

// Opens, writes, closes. 0, or the errno.
int writeControl(int directory, const char *name, std::string_view text);

// Without the line's end. Throws KernelError.
std::string readControl(int directory, const char *name);

// Nothing when there is no such file: the controller is not passed on, or the kernel is older.
std::optional<std::string> readControlIfAny(int directory, const char *name);

// An extended attribute of the directory; nothing when it has none. Throws KernelError.
std::optional<std::string> readAttribute(int directory, const char *name);

// Throw KernelError; for kNew: exists, when the directory has such an attribute already.
enum class Attribute { kNew, kAny };
void writeAttribute(int directory, const char *name, std::string_view value,
                    Attribute kind = Attribute::kAny);
void removeAttribute(int directory, const char *name);

}  // namespace Knob::Linux
