// SPDX-License-Identifier: Apache-2.0
// What may name a group. The same on every kernel, and strict enough for the strictest.
#pragma once

#include <optional>
#include <string_view>
#include <vector>

namespace Knob {

inline constexpr std::string_view kRootName = "host";
inline constexpr std::string_view kFixedChildName = "opt";

// Whether a component may name a group: 1 to 255 bytes; not "." or ".."; no '/', NUL or line feed;
// and not beginning like a control file of Linux ("memory.", "cpu."), which Linux would take for
// that file.
bool isGroupName(std::string_view name);

// The components of a path, or nothing when one of them can name no group. The views point into
// the path.
std::optional<std::vector<std::string_view>> splitPath(std::string_view path);

}  // namespace Knob
