// SPDX-License-Identifier: Apache-2.0
// Pools and groups for the measurements on the Linux kernel.
#include "pools.h"

#include <unistd.h>

#include <cstdio>
#include <fstream>
#include <stdexcept>

namespace Bench {
namespace {

namespace fs = std::filesystem;

void enableControllers(const fs::path &group) {
  std::ofstream file(group / "cgroup.subtree_control");
  file << "+memory +cpu" << std::flush;
  if (!file) throw std::runtime_error(group.string() + ": no controllers");
}

}  // namespace

std::string poolName(int pool) {
  char name[16];
  std::snprintf(name, sizeof name, "p%05d", pool);
  return name;
}

void writePoolDefinitions(const fs::path &path, int pools) {
  std::ofstream file(path);
  for (int i = 0; i < pools; ++i) {
    file << "- name: " << poolName(i) << '\n';
    if (poolMinimumMB(i) != 0) file << "  memMin: " << poolMinimumMB(i) << '\n';
    file << "  memMax: 64\n  cpuMax: 50\n  cpuShares: 2000\n";
  }
}

fs::path makePoolParent(const char *name) {
  fs::path group = kCgroupMount;
  enableControllers(group);
  for (const char *part : {name, "opt"}) {
    group /= part;
    fs::create_directory(group);
    enableControllers(group);
  }
  return group;
}

void removePoolGroups(const fs::path &parent, int pools) {
  for (int i = 0; i < pools; ++i)
    if (rmdir((parent / poolName(i)).c_str()) != 0) throw std::runtime_error("rmdir of a group");
}

void requirePoolGroups(const fs::path &parent, int pools) {
  std::ifstream file(parent / poolName(pools - 1) / "memory.max");
  std::string text;
  if (!(file >> text) || text != "67108864")
    throw std::runtime_error(parent.string() + ": no load");
}

}  // namespace Bench
