// SPDX-License-Identifier: Apache-2.0
// The pools that the measurements on the Linux kernel load: on each run the same, with a memory
// reservation for every eighth. bare_groups writes the same values without poolctl.
#pragma once

#include <filesystem>
#include <string>

namespace Bench {

constexpr const char *kCgroupMount = "/sys/fs/cgroup";

std::string poolName(int pool);

// More than every eighth, and the machine would not have enough for the largest number of pools.
inline int poolMinimumMB(int pool) {
  return pool % 8 == 0 ? 1 : 0;
}

// As people write them: what is the default anyway is left out.
void writePoolDefinitions(const std::filesystem::path &path, int pools);

// Makes NAME/opt below the mount, with the controllers that pools need, as deep as host/opt.
// Throws std::runtime_error when the kernel refuses the controllers.
std::filesystem::path makePoolParent(const char *name);

void removePoolGroups(const std::filesystem::path &parent, int pools);

// Throws std::runtime_error when the last of the pools does not have its settings.
void requirePoolGroups(const std::filesystem::path &parent, int pools);

}  // namespace Bench
