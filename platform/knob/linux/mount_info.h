// SPDX-License-Identifier: Apache-2.0
// Reads the text of /proc/self/mountinfo, as far as control groups are concerned.
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace Knob::Linux {

struct CgroupMount {
  int id = 0;
  std::string root;   // the group that the mount shows as its root; "/" is the whole hierarchy
  std::string point;  // where it is mounted
  bool readOnly = false;
};

struct CgroupMounts {
  std::vector<CgroupMount> unified;            // cgroup2, in the order of mounting
  std::vector<std::string> legacyControllers;  // named by mounts of the old hierarchies
};

// Lines that are no mounts are passed over.
CgroupMounts parseMountInfo(std::string_view text);

}  // namespace Knob::Linux
