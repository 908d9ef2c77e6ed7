// SPDX-License-Identifier: Apache-2.0
// The tree of groups below the folder that holds host: from paths and ids to open directories and
// up to host, and what is done with a directory as a whole. The directories of the groups used last
// stay open.
//
// Functions that take a group throw KernelError: not found, when it was deleted.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "common/unique_fd.h"
#include "knob/kernel.h"
#include "knob/linux/cgroup_files.h"
#include "knob/linux/hierarchy.h"

namespace Knob::Linux {

// An open group.
struct Group {
  GroupId id = 0;
  GroupId parent = 0;  // 0: not known yet, or host
  std::string name;    // empty: not known yet
  Platform::UniqueFd directory;
  uint64_t lastUse = 0;

  int fd() const { return directory.get(); }
};
using GroupPtr = std::shared_ptr<Group>;

class CgroupTree {
 public:
  explicit CgroupTree(Hierarchy hierarchy);

  const Hierarchy &hierarchy() const { return hierarchy_; }

  // The group at a path whose components are group names; empty when there is none. Throws
  // KernelError.
  GroupPtr lookUp(std::string_view path);

  // host; empty when there is none. Throws KernelError.
  GroupPtr host();

  // The group of an id, which must be host or below it. A group that is open may have been deleted
  // meanwhile. Throws KernelError (not found).
  GroupPtr find(GroupId id);

  // The group above; empty for host. Throws KernelError.
  GroupPtr parentOf(Group &group);

  // Makes a group with the memory and cpu controllers. Throws KernelError: exists, busy (processes
  // are in the parent), out of memory, not supported (an administrator's limit); nothing is made.
  GroupPtr make(Group &parent, std::string_view name);

  // Makes host. Throws KernelError.
  GroupPtr makeHost();

  // Removes the group, and disables the controllers below its parent when it was the last child.
  // Throws KernelError (busy, not found).
  void remove(Group &group, Group &parent);

  // The group's name in its parent's directory, and its path from host on.
  const std::string &nameOf(Group &group);
  std::string pathOf(Group &group);

  bool hasChildren(const Group &group) const;

  // The groups of other programs beside host. Throws KernelError.
  std::vector<Child> besideHost() const;

  void requireAlive(const Group &group) const;

  // Whether living processes are in the group or below it.
  bool isPopulated(const Group &group) const;

  // The group that a process is in; empty when it is not in the tree, or has ended.
  GroupPtr groupOf(int64_t pid);

  // Moves a process into a group without child groups. Throws KernelError: not found (no such
  // living process), bad parameter (a kernel thread).
  void addMember(Group &group, int64_t pid);

  // Writes a control file. When another program has disabled its controller, enables it again.
  // Throws KernelError.
  void write(Group &group, Control control, std::string_view text);

 private:
  GroupPtr lookUpKnown(std::string_view path);
  GroupPtr openChild(const Group *parent, std::string_view name);
  GroupPtr makeIn(int directory, std::string_view name);
  GroupPtr adopt(Platform::UniqueFd directory, GroupId id);
  GroupPtr findUpwards(Platform::UniqueFd directory, GroupId id);
  GroupPtr findByWalking(GroupId id);
  GroupId requireHost();
  void takeHost(GroupId id);
  void remember(std::string_view path, GroupId id);
  void closeLeastUsed();
  void enableControllersOfHost();
  void enableControllersIn(Group &group);
  void enableControllersBelow(Group &group);
  void disableControllersBelow(const Group &group) const noexcept;

  Hierarchy hierarchy_;
  uint64_t mount_ = 0;
  std::unordered_map<GroupId, GroupPtr> groups_;
  std::unordered_map<std::string, GroupId> paths_;
  GroupId hostId_ = 0;
  uint64_t uses_ = 0;
};

}  // namespace Knob::Linux
