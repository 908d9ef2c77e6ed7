// SPDX-License-Identifier: Apache-2.0
// The kernel's own view of the groups: what its control files say, read past libknob. A path is a
// group's path as pools have it ("host/opt/web"), which is its folder below the mount.
#pragma once

#include <cstdint>
#include <filesystem>
#include <map>
#include <string>
#include <vector>

namespace Uml {

inline const std::filesystem::path kMount = "/sys/fs/cgroup";
constexpr int64_t kMiB = 1024 * 1024;
constexpr int64_t kMax = -1;  // a control file that says "max"

// The content without the line feed at its end. Throws std::system_error.
std::string readControl(const std::string &path, const std::string &file);

// One number, or kMax.
int64_t numberIn(const std::string &path, const std::string &file);

// The number that a line "KEY NUMBER" gives; 0 without such a line.
int64_t numberIn(const std::string &path, const std::string &file, const std::string &key);

void writeControl(const std::string &path, const std::string &file, const std::string &text);

bool groupExists(const std::string &path);

// Every group below the mount, parents before their children.
std::vector<std::string> allGroups();

// All processes that the kernel has killed in any group for want of memory.
int64_t oomKills();

// Kills what lives in groups, and removes them. keep: those that stay.
void removeGroups(const std::vector<std::string> &keep);

// Makes the fixed groups, where they are, as new as they were at first, and removes all others: for
// a process whose libknob has the tree open. What libknob knew of the fixed ones is gone with their
// record.
void startTreeAnew();

// The groups that are there before the first pool is.
inline const std::vector<std::string> kFixedGroups = {"host", "host/opt"};

}  // namespace Uml
