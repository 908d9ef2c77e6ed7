// SPDX-License-Identifier: Apache-2.0
// The directories of groups: from paths and ids to open descriptors, and back up to host. The
// descriptors of the groups used last are kept; a descriptor stays with its group for ever, so a
// group that was deleted answers ENOENT or ENODEV even when another one of its name was made.
#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "knob/kernel.h"
#include "knob/linux/cgroup_files.h"
#include "knob/linux/descriptor_set.h"
#include "knob/linux/hierarchy.h"

namespace Knob::Linux {

// One group in use. Its descriptors live as long as it does.
struct Group {
  GroupId id = 0;
  GroupId parent = 0;  // 0: not looked at yet, or host
  std::string name;    // empty: not looked at yet
  int directory = -1;
  std::array<int, kControls.size()> controls = {-1, -1, -1, -1};  // opened for writing
  int events = -1;  // cgroup.events, opened for reading
  // Of a group that this process made, and that has no record as far as it knows: its memory
  // maximum in MB, all that it has been given; -1: no limit.
  std::optional<int64_t> unrecordedMax;
  bool passesOn = false;   // this process has seen to it that children get their controllers
  bool hasMemory = false;  // this process has seen that its memory maximum is not 0
  uint64_t lastUse = 0;
  DescriptorSet descriptors;  // owns all of the above
};
using GroupPtr = std::shared_ptr<Group>;

struct Child {
  GroupId id;
  std::string name;
};

class Groups {
 public:
  explicit Groups(Hierarchy hierarchy);

  const Hierarchy &hierarchy() const { return hierarchy_; }

  // The group at a path of good names; empty when there is none. Throws KernelError.
  GroupPtr lookUp(std::string_view path);

  // The group host as it is now; empty when there is none. Throws KernelError.
  GroupPtr host();

  // The host of the groups that are open. Empty when there is none. Throws KernelError.
  GroupPtr openHost();

  // The group of an id, which must be host or below it. Throws KernelError (not found).
  GroupPtr find(GroupId id);

  // The group above; empty for host.
  GroupPtr parentOf(Group &group);

  // Makes a directory. The parent passes its controllers on already. Throws KernelError.
  GroupPtr make(Group &parent, std::string_view name);

  // Makes host, with the controllers passed on to it. Throws KernelError.
  GroupPtr makeHost();

  // Removes the directory. Throws KernelError (busy, not found).
  void remove(Group &group, Group &parent);

  // The group's name in its parent's directory. Throws KernelError (not found).
  const std::string &nameOf(Group &group);

  // The child groups. One that goes away meanwhile hides no other. Throws KernelError (not found).
  std::vector<Child> children(const Group &group) const;

  bool hasChildren(const Group &group) const;

  // Throws KernelError (not found) when the group was deleted.
  void requireAlive(const Group &group) const;

  // Whether living processes are in the group or below it. Throws KernelError.
  bool isPopulated(Group &group);

  // Makes this group and all above it pass the controllers on. Throws KernelError: busy, when
  // processes are in one of them.
  void passOn(Group &group);

  // Ends that in a group that has no child groups, so that it takes processes. Throws nothing: the
  // next process that joins it tries again.
  void takeBack(Group &group) const noexcept;

  // Opens a control file for writing, or gives the descriptor that is open already. Throws.
  int open(Group &group, Control control);

  // Writes it. Throws.
  void write(Group &group, Control control, std::string_view text);

  void forget(GroupId id) { groups_.erase(id); }

 private:
  GroupPtr openKnown(const std::string &path);
  GroupPtr makeIn(int parentDirectory, std::string_view name);
  bool readPopulated(Group &group);
  void passOnToHost() const;
  static int keep(Group &group, Platform::UniqueFd file);
  GroupPtr adopt(Platform::UniqueFd directory, GroupId id);
  GroupPtr findUpwards(Platform::UniqueFd directory, GroupId id);
  GroupPtr findByWalking(GroupId id);
  GroupId hostId();
  void takeHost(GroupId id);
  void makeRoom();

  Hierarchy hierarchy_;
  uint64_t mount_ = 0;
  std::unordered_map<GroupId, GroupPtr> groups_;
  std::unordered_map<std::string, GroupId> paths_;
  GroupId hostId_ = 0;
  uint64_t uses_ = 0;
};

}  // namespace Knob::Linux
