// SPDX-License-Identifier: Apache-2.0
// From paths and ids to groups in use, and which of them stay open.
#include "knob/linux/cgroup_tree.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <utility>

#include "knob/linux/beneath.h"
#include "knob/linux/control_values.h"
#include "knob/linux/errno_status.h"
#include "knob/names.h"

namespace Knob::Linux {
namespace {

using Platform::UniqueFd;

// With six descriptors for each group at most, far from every process's limit. Room is made in
// bulk, since closing in bulk is cheap.
constexpr size_t kMostGroupsOpen = 48, kGroupsKept = 8;
constexpr size_t kMostPathsKnown = 64;
static_assert(sizeof(ino_t) == sizeof(GroupId), "an inode number is a group's id");

}  // namespace

Groups::Groups(Hierarchy hierarchy) : hierarchy_(std::move(hierarchy)) {
  Identity identity;
  if (const int error = identify(hierarchy_.directory.get(), "", identity); error != 0) {
    fail(error, "cannot look at " + hierarchy_.path);
  }
  mount_ = identity.mount;
}

GroupPtr Groups::lookUp(std::string_view path) {
  const std::string text(path);
  if (GroupPtr group = openKnown(text)) return group;
  UniqueFd directory;
  const int error = openBeneath(hierarchy_.directory.get(), path, directory);
  if (statusOf(error) == Status::kNotFound) return {};
  if (error != 0) fail(error, "cannot open " + text);

  Identity identity;
  if (const int failure = identify(directory.get(), "", identity); failure != 0) {
    fail(failure, "cannot tell the id of " + text);
  }
  if (path == kRootName) {
    takeHost(identity.id);
  } else if (!host()) {
    return {};
  }
  if (path.size() < PATH_MAX) {
    if (paths_.size() >= kMostPathsKnown) paths_.clear();
    paths_[text] = identity.id;
  }
  GroupPtr group = adopt(std::move(directory), identity.id);
  group->name = path.substr(path.rfind('/') + 1);
  return group;
}

// Groups are never renamed: while the path still leads to this id, all that was checked when it was
// first looked up holds.
GroupPtr Groups::openKnown(const std::string &path) {
  const auto known = paths_.find(path);
  if (known == paths_.end()) return {};
  if (const auto open = groups_.find(known->second); open != groups_.end()) {
    Identity identity;
    if (identify(hierarchy_.directory.get(), path.c_str(), identity) == 0 &&
        identity.id == known->second) {
      return find(identity.id);
    }
    groups_.erase(open);
  }
  paths_.erase(known);
  return {};
}

// Host cannot go while a group lives below it. So whatever was opened while it was this one is
// either still below it, or gone itself; it is looked at only when something new is opened.
GroupPtr Groups::host() {
  return lookUp(kRootName);
}

void Groups::takeHost(GroupId id) {
  if (id == hostId_) return;
  groups_.clear();
  paths_.clear();
  hostId_ = id;
}

GroupPtr Groups::openHost() {
  if (const auto open = groups_.find(hostId_); open != groups_.end()) return open->second;
  return host();
}

GroupPtr Groups::find(GroupId id) {
  if (const auto known = groups_.find(id); known != groups_.end()) {
    known->second->lastUse = ++uses_;
    return known->second;
  }
  if (id <= 0) noSuchGroup();
  UniqueFd directory;
  const int error = openById(hierarchy_.directory.get(), id, directory);
  if (error == 0) return findUpwards(std::move(directory), id);
  if (error == EPERM || error == EACCES || error == ENOSYS || error == EOPNOTSUPP) {
    return findByWalking(id);
  }
  // An id that is none is answered as one that is gone.
  if (error == EINVAL || statusOf(error) == Status::kNotFound) noSuchGroup();
  fail(error, "cannot open group " + std::to_string(id));
}

GroupPtr Groups::parentOf(Group &group) {
  if (group.id == hostId()) return {};
  if (group.parent != 0) return find(group.parent);
  UniqueFd directory(::openat(group.directory, "..", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!directory) fail(errno, "cannot open the group above");
  Identity identity;
  if (const int error = identify(directory.get(), "", identity); error != 0) {
    fail(error, "cannot tell the id of the group above");
  }
  // Above the mount's own root stand other file systems, with numbers of their own.
  if (identity.mount != mount_) noSuchGroup();
  group.parent = identity.id;
  return adopt(std::move(directory), identity.id);
}

int Groups::keep(Group &group, UniqueFd file) {
  const int descriptor = file.release();
  group.descriptors.add(descriptor);
  return descriptor;
}

GroupPtr Groups::adopt(UniqueFd directory, GroupId id) {
  if (const auto known = groups_.find(id); known != groups_.end()) {
    known->second->lastUse = ++uses_;
    return known->second;
  }
  makeRoom();
  auto group = std::make_shared<Group>();
  group->id = id;
  group->directory = keep(*group, std::move(directory));
  group->lastUse = ++uses_;
  groups_[id] = group;
  return group;
}

// An id is known to the whole machine; only what is below host is ours.
GroupPtr Groups::findUpwards(UniqueFd directory, GroupId id) {
  if (!host()) noSuchGroup();
  GroupPtr group = adopt(std::move(directory), id);
  try {
    for (GroupPtr at = group; at->id != hostId_; at = parentOf(*at)) {
    }
  } catch (const KernelError &) {
    groups_.clear();
    throw;
  }
  return group;
}

GroupPtr Groups::findByWalking(GroupId id) {
  if (id == hostId()) return lookUp(kRootName);
  std::vector<std::string> folders = {std::string(kRootName)};
  while (!folders.empty()) {
    const std::string folder = std::move(folders.back());
    folders.pop_back();
    UniqueFd directory;
    if (openBeneath(hierarchy_.directory.get(), folder, directory) != 0) continue;
    Group group;
    group.directory = directory.get();
    for (Child &child : children(group)) {
      const std::string path = folder + "/" + child.name;
      if (child.id == id) {
        GroupPtr found = lookUp(path);
        if (found && found->id == id) return found;
        noSuchGroup();
      }
      folders.push_back(path);
    }
  }
  noSuchGroup();
}

GroupId Groups::hostId() {
  if (hostId_ == 0 && !host()) noSuchGroup();
  return hostId_;
}

void Groups::makeRoom() {
  if (groups_.size() < kMostGroupsOpen) return;
  std::vector<std::pair<uint64_t, GroupId>> byUse;
  for (const auto &[id, group] : groups_) {
    if (group.use_count() == 1) byUse.emplace_back(group->lastUse, id);
  }
  std::sort(byUse.begin(), byUse.end());
  DescriptorSet closing;
  for (const auto &[lastUse, id] : byUse) {
    if (groups_.size() <= kGroupsKept) break;
    closing.take(std::move(groups_[id]->descriptors));
    groups_.erase(id);
  }
}

}  // namespace Knob::Linux
