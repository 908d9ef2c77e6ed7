// SPDX-License-Identifier: Apache-2.0
// The place where the tree stands: finding the cgroup2 mount and the folder below it, and telling
// what a host lacks that cannot be used, with the way to mend it.
#pragma once

#include <string>

#include "common/unique_fd.h"
#include "knob/configuration.h"
#include "knob/linux/mount_info.h"

namespace Knob::Linux {

// The controllers that a group needs, and how they are passed on to the groups below one: in one
// write, since "+cpu" alone would succeed in a group with processes and make it a threaded one.
inline constexpr const char *kPassOn = "+memory +cpu";
inline constexpr const char *kTakeBack = "-memory -cpu";

struct Hierarchy {
  Platform::UniqueFd directory;  // the folder that holds, or will hold, host
  std::string path;              // of that folder, for people
};

// Throws KernelError: kernel not usable, with the reason and how to mend it.
Hierarchy openHierarchy(const Configuration &configuration);

// How a cgroup.controllers that lacks memory or cpu is told, given the mounts; empty when it lacks
// neither. folder: for the message. isTop: it is the whole hierarchy's root.
std::string missingControllers(const std::string &controllers, const CgroupMounts &mounts,
                               const std::string &folder, bool isTop);

}  // namespace Knob::Linux
