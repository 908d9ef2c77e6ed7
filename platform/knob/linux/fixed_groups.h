// SPDX-License-Identifier: Apache-2.0
// host and host/opt, which exist from the start: made at first use, together with the signature of
// the library that made them.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "knob/kernel.h"
#include "knob/linux/cgroup_tree.h"

namespace Knob::Linux {

inline constexpr const char *kLibraryAttribute = "user.knob.library";

// What to do when a process may not change groups.
inline constexpr const char *kHowToGetRights =
    "; run as root, or set cgroup-root in knob.conf to a group that you own";

// Whether a group is host or host/opt. Throws KernelError.
bool isFixedGroup(CgroupTree &tree, Group &group);

// Makes those of the two that do not exist. Throws KernelError: kernel not usable, with the reason
// and what to do.
void makeFixedGroups(CgroupTree &tree);

// The signature of the library that made host. It is this library's own where there is no host yet,
// or only the two fixed groups, which any library can take over.
BuildSignature readSignature(CgroupTree &tree);

// Stores this library's signature in host.
void writeSignature(const Group &host);

// "MD5 BUILDDATE" and back. Nothing: it is not such a text.
std::string signatureText(const BuildSignature &signature);
std::optional<BuildSignature> parseSignature(std::string_view text);

}  // namespace Knob::Linux
