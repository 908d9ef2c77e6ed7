// SPDX-License-Identifier: Apache-2.0
// host and host/opt, which exist from the start: made at first use, together with the note of the
// library that made them.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "knob/kernel.h"
#include "knob/linux/cgroup_tree.h"

namespace Knob::Linux {

// How to mend that a process has no right to groups.
inline constexpr const char *kMendRights =
    "; run as root, or let cgroup-root in knob.conf name a group that is yours";

// Makes what is missing of the two. Throws KernelError: kernel not usable, with the reason and how
// to mend it.
void makeFixedGroups(Groups &groups);

// Of the library that made host; this library's own where there is no host yet, or only the two
// fixed groups, which any library can take over.
BuildSignature readSignature(Groups &groups);

// Notes this library as the one that made host.
void writeSignature(const Group &host);

// The text of the note and back. Nothing: no such text.
std::string signatureText(const BuildSignature &signature);
std::optional<BuildSignature> parseSignature(std::string_view text);

}  // namespace Knob::Linux
