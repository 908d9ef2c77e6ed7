// Looking groups up, making and removing their directories.
#include "knob/linux/groups.h"

#include <dirent.h>
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

constexpr mode_t kDirectoryMode = 0755;
// With five descriptors for each group at most, far from every process's limit. Room is made in
// bulk, since closing in bulk is cheap.
constexpr size_t kMostGroupsOpen = 48, kGroupsKept = 8;
constexpr size_t kMostPathsKnown = 64;
static_assert(sizeof(ino_t) == sizeof(GroupId), "an inode number is a group's id");

// A directory's own two links; each directory in it adds one.
constexpr nlink_t kLinksOfALeaf = 2;

struct DirectoryCloser {
  void operator()(DIR *directory) const { (void)::closedir(directory); }
};

[[noreturn]] void notFound() {
  throw KernelError(Status::kNotFound, "no such group");
}

int keep(Group &group, UniqueFd file) {
  const int descriptor = file.release();
  group.descriptors.add(descriptor);
  return descriptor;
}

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
  const GroupPtr group = adopt(std::move(directory), identity.id);
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
  if (id <= 0) notFound();
  UniqueFd directory;
  const int error = openById(hierarchy_.directory.get(), id, directory);
  if (error == 0) return findUpwards(std::move(directory), id);
  if (error == EPERM || error == EACCES || error == ENOSYS || error == EOPNOTSUPP) {
    return findByWalking(id);
  }
  // An id that is none is answered as one that is gone.
  if (error == EINVAL || statusOf(error) == Status::kNotFound) notFound();
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
  if (identity.mount != mount_) notFound();
  group.parent = identity.id;
  return adopt(std::move(directory), identity.id);
}

GroupPtr Groups::make(Group &parent, std::string_view name) {
  const GroupPtr group = makeIn(parent.directory, name);
  group->parent = parent.id;
  return group;
}

GroupPtr Groups::makeHost() {
  passOnToHost();
  (void)makeIn(hierarchy_.directory.get(), kRootName);
  return host();
}

GroupPtr Groups::makeIn(int parentDirectory, std::string_view name) {
  const std::string text(name);
  UniqueFd directory;
  Identity identity;
  // Another process may remove the new group before it is opened; then it is made once more.
  int error = 0;
  do {
    if (::mkdirat(parentDirectory, text.c_str(), kDirectoryMode) != 0) {
      fail(errno, "cannot make " + text);
    }
    error = openBeneath(parentDirectory, text, directory);
  } while (error == ENOENT);
  if (error == 0) error = identify(directory.get(), "", identity);
  if (error != 0) {
    (void)::unlinkat(parentDirectory, text.c_str(), AT_REMOVEDIR);  // the first error counts
    fail(error, "cannot open " + text);
  }
  const GroupPtr group = adopt(std::move(directory), identity.id);
  group->name = text;
  group->unrecordedMax = -1;
  return group;
}

void Groups::remove(Group &group, Group &parent) {
  const std::string &name = nameOf(group);
  Identity identity;
  if (identify(parent.directory, name.c_str(), identity) != 0 || identity.id != group.id) {
    forget(group.id);
    notFound();
  }
  if (::unlinkat(parent.directory, name.c_str(), AT_REMOVEDIR) != 0) {
    fail(errno, "cannot remove " + name);
  }
  forget(group.id);
}

const std::string &Groups::nameOf(Group &group) {
  if (!group.name.empty()) return group.name;
  std::array<char, PATH_MAX> target;
  const std::string link = "/proc/self/fd/" + std::to_string(group.directory);
  const ssize_t size = ::readlink(link.c_str(), target.data(), target.size());
  if (size < 0) fail(errno, "cannot tell the name of group " + std::to_string(group.id));
  const std::string_view path(target.data(), static_cast<size_t>(size));
  group.name = path.substr(path.rfind('/') + 1);
  return group.name;
}

std::vector<Child> Groups::children(const Group &group) const {
  UniqueFd directory(::openat(group.directory, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!directory) fail(errno, "cannot read the group's directory");
  const std::unique_ptr<DIR, DirectoryCloser> stream(::fdopendir(directory.get()));
  if (!stream) fail(errno, "cannot read the group's directory");
  (void)directory.release();  // the stream's now

  std::vector<Child> children;
  for (errno = 0; const dirent *entry = ::readdir(stream.get()); errno = 0) {
    const std::string_view name = entry->d_name;
    if (entry->d_type != DT_DIR || name == "." || name == "..") continue;
    children.push_back({static_cast<GroupId>(entry->d_ino), std::string(name)});
  }
  if (errno != 0) fail(errno, "cannot read the group's directory");
  return children;
}

bool Groups::hasChildren(const Group &group) const {
  struct stat status {};
  if (::fstat(group.directory, &status) != 0) fail(errno, "cannot look at the group");
  return status.st_nlink > kLinksOfALeaf;
}

void Groups::requireAlive(const Group &group) const {
  if (::faccessat(group.directory, kMembersFile, F_OK, 0) != 0) notFound();
}

bool Groups::isPopulated(Group &group) {
  // Of many groups made in one, none needs its own file while nothing lives in any of them.
  if (const auto parent = groups_.find(group.parent); group.events < 0 && parent != groups_.end()) {
    if (!readPopulated(*parent->second)) return false;
  }
  return readPopulated(group);
}

bool Groups::readPopulated(Group &group) {
  if (group.events < 0) {
    UniqueFd file(::openat(group.directory, kEventsFile, O_RDONLY | O_CLOEXEC | O_NOFOLLOW));
    if (!file) fail(errno, std::string("cannot open ") + kEventsFile + " of " + nameOf(group));
    group.events = keep(group, std::move(file));
  }
  std::array<char, 128> text;  // two short lines
  const ssize_t size = ::pread(group.events, text.data(), text.size(), 0);
  if (size < 0) fail(errno, std::string("cannot read ") + kEventsFile + " of " + nameOf(group));
  return keyedValue({text.data(), static_cast<size_t>(size)}, "populated").value_or(1) != 0;
}

void Groups::passOn(Group &group) {
  if (group.passesOn) return;
  if (const GroupPtr parent = parentOf(group)) {
    passOn(*parent);
  } else {
    passOnToHost();
  }
  if (const int error = writeControl(group.directory, kSubtreeFile, kPassOn); error != 0) {
    fail(error, "cannot pass memory and cpu on below " + nameOf(group));
  }
  group.passesOn = true;
}

void Groups::takeBack(Group &group) const noexcept {
  struct stat status {};
  if (::fstat(group.directory, &status) != 0 || status.st_nlink > kLinksOfALeaf) return;
  (void)writeControl(group.directory, kSubtreeFile, kTakeBack);
  group.passesOn = false;
}

void Groups::passOnToHost() const {
  const int error = writeControl(hierarchy_.directory.get(), kSubtreeFile, kPassOn);
  if (error != 0) fail(error, "cannot pass memory and cpu on below " + hierarchy_.path);
}

int Groups::open(Group &group, Control control) {
  int &descriptor = group.controls[static_cast<size_t>(control)];
  if (descriptor >= 0) return descriptor;
  const char *name = rowOf(control).name;
  UniqueFd file;
  int error = openForWriting(group.directory, name, file);
  if (error == ENOENT) {
    requireAlive(group);
    // Somebody took the controller back. The parent passes it on again, if it can.
    const GroupPtr parent = parentOf(group);
    for (GroupPtr above = parent; above; above = parentOf(*above)) above->passesOn = false;
    if (parent) passOn(*parent);
    error = openForWriting(group.directory, name, file);
  }
  if (error != 0) fail(error, std::string("cannot open ") + name + " of " + nameOf(group));
  descriptor = keep(group, std::move(file));
  return descriptor;
}

void Groups::write(Group &group, Control control, std::string_view text) {
  int error = writeWhole(open(group, control), text);
  if (error == ENODEV) {
    // The file is gone: with its group, or made anew with its controller.
    group.controls[static_cast<size_t>(control)] = -1;
    error = writeWhole(open(group, control), text);
  }
  if (error == 0) return;
  fail(error, std::string("cannot write \"") + std::string(text) + "\" to " + rowOf(control).name +
                  " of " + nameOf(group));
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
  if (!host()) notFound();
  const GroupPtr group = adopt(std::move(directory), id);
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
        const GroupPtr found = lookUp(path);
        if (found && found->id == id) return found;
        notFound();
      }
      folders.push_back(path);
    }
  }
  notFound();
}

GroupId Groups::hostId() {
  if (hostId_ == 0 && !host()) notFound();
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
