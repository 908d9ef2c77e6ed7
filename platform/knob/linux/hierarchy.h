// SPDX-License-Identifier: Apache-2.0
// Where the tree is: finds the cgroup2 mount and the folder below it, and explains what a machine
// lacks that cannot be used, and what to do.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "common/unique_fd.h"
#include "knob/configuration.h"

namespace Knob::Linux {

struct CgroupMount {
  int id = 0;
  std::string root;   // the group that the mount shows as its root; "/" is the whole hierarchy
  std::string point;  // where it is mounted
  bool readOnly = false;
  bool protectsRecursively = false;  // memory_recursiveprot
};

struct CgroupMounts {
  std::vector<CgroupMount> unified;            // cgroup2, in the order of mounting
  std::vector<std::string> legacyControllers;  // named by mounts of the old hierarchies
};

// From the text of /proc/self/mountinfo. Ignores lines that do not describe a mount.
CgroupMounts parseMountInfo(std::string_view text);

struct Hierarchy {
  Platform::UniqueFd directory;  // the folder that contains, or will contain, host
  std::string path;              // of that folder, for people
  // Whether what a group reserves protects its child groups too, beyond what they reserve
  // themselves: the mount option memory_recursiveprot.
  bool protectsRecursively = false;
};

// Throws KernelError: kernel not usable, with the reason and what to do.
Hierarchy openHierarchy(const Configuration &configuration);

// Why a cgroup.controllers lacks memory or cpu, given the mounts; empty when it lacks neither.
// folder: for the message. isTop: it is the root of the whole hierarchy.
std::string missingControllers(const std::string &controllers, const CgroupMounts &mounts,
                               const std::string &folder, bool isTop);

}  // namespace Knob::Linux
