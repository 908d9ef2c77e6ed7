// SPDX-License-Identifier: Apache-2.0
// What is done with a group's directory and its files: making and removing, looking into it,
// passing controllers on, writing settings.
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <climits>

#include "knob/linux/beneath.h"
#include "knob/linux/cgroup_tree.h"
#include "knob/linux/control_values.h"
#include "knob/linux/errno_status.h"
#include "knob/names.h"

namespace Knob::Linux {
namespace {

using Platform::UniqueFd;

constexpr mode_t kDirectoryMode = 0755;
// A directory's own two links; each directory in it adds one.
constexpr nlink_t kLinksOfALeaf = 2;

struct DirectoryCloser {
  void operator()(DIR *directory) const { (void)::closedir(directory); }
};

}  // namespace

GroupPtr Groups::make(Group &parent, std::string_view name) {
  GroupPtr group = makeIn(parent.directory, name);
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
  GroupPtr group = adopt(std::move(directory), identity.id);
  group->name = text;
  group->unrecordedMax = -1;
  return group;
}

void Groups::remove(Group &group, Group &parent) {
  const std::string &name = nameOf(group);
  Identity identity;
  if (identify(parent.directory, name.c_str(), identity) != 0 || identity.id != group.id) {
    forget(group.id);
    noSuchGroup();
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
  if (::faccessat(group.directory, kMembersFile, F_OK, 0) != 0) noSuchGroup();
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

}  // namespace Knob::Linux
