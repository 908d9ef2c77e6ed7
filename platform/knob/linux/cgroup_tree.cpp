// SPDX-License-Identifier: Apache-2.0
// Groups are never renamed on cgroup v2. So while a path leads to the same id as before, all that
// was checked when it was first looked up still holds.
#include "knob/linux/cgroup_tree.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <limits>
#include <system_error>
#include <utility>

#include "common/read_file.h"
#include "knob/linux/beneath.h"
#include "knob/linux/control_values.h"
#include "knob/names.h"

namespace Knob::Linux {
namespace {

using Platform::UniqueFd;

constexpr mode_t kDirectoryMode = 0755;
// A directory's own two links; each directory in it adds one.
constexpr nlink_t kLinksOfALeaf = 2;
constexpr size_t kMaxOpenGroups = 48;
constexpr size_t kMaxKnownPaths = 64;
constexpr size_t kMaxProcBytes = 16384;
static_assert(sizeof(ino_t) == sizeof(GroupId), "an inode number is a group's id");

// In one write: in a group with processes "+cpu" alone would succeed and make it a threaded one.
constexpr const char *kEnable = "+memory +cpu";
constexpr const char *kDisable = "-memory -cpu";

// Both controllers are enabled in one write, so the file of one is enough.
bool hasControllers(const Group &group) {
  return hasControl(group.fd(), infoOf(Control::kMemoryMax).name);
}

// Empty when the process has ended.
std::string procText(int64_t pid, const char *file) {
  try {
    return Platform::readFile("/proc/" + std::to_string(pid) + "/" + file, kMaxProcBytes);
  } catch (const std::system_error &) {
    return {};
  }
}

bool isAlive(int64_t pid) {
  const std::string stat = procText(pid, "stat");
  // "PID (NAME) STATE ...": the name may contain parentheses too.
  const size_t state = stat.rfind(") ") + 2;
  return state < stat.size() && stat[state] != 'Z' && stat[state] != 'X';
}

std::string_view lastComponent(std::string_view path) {
  return path.substr(path.rfind('/') + 1);
}

// Returns 0 or the errno.
int openGroup(int directory, std::string_view name, UniqueFd &opened, Identity &identity) {
  const int error = openBeneath(directory, name, opened);
  return error != 0 ? error : identify(opened.get(), "", identity);
}

}  // namespace

CgroupTree::CgroupTree(Hierarchy hierarchy) : hierarchy_(std::move(hierarchy)) {
  Identity identity;
  if (const int error = identify(hierarchy_.directory.get(), "", identity); error != 0) {
    fail(error, "cannot identify " + hierarchy_.path);
  }
  mount_ = identity.mount;
}

GroupPtr CgroupTree::lookUp(std::string_view path) {
  if (GroupPtr group = lookUpKnown(path)) return group;
  // Most often the parent is known.
  const size_t last = path.rfind('/');
  GroupPtr group = last == std::string_view::npos ? GroupPtr() : lookUpKnown(path.substr(0, last));
  for (size_t start = group ? last + 1 : 0; start <= path.size();) {
    const size_t end = std::min(path.find('/', start), path.size());
    const std::string_view prefix = path.substr(0, end);
    GroupPtr child = lookUpKnown(prefix);
    if (!child) child = openChild(group.get(), path.substr(start, end - start));
    if (!child) return {};
    remember(prefix, child->id);
    group = std::move(child);
    start = end + 1;
  }
  return group;
}

// parent: null for host.
GroupPtr CgroupTree::openChild(const Group *parent, std::string_view name) {
  if (parent == nullptr && name != kRootName) return {};
  UniqueFd directory;
  Identity identity;
  const int error = openGroup(parent == nullptr ? hierarchy_.directory.get() : parent->fd(), name,
                              directory, identity);
  if (statusOf(error) == Status::kNotFound) return {};
  if (error != 0) fail(error, "cannot open " + std::string(name));
  if (parent == nullptr) takeHost(identity.id);
  GroupPtr group = adopt(std::move(directory), identity.id);
  group->name = name;
  group->parent = parent == nullptr ? 0 : parent->id;
  return group;
}

GroupPtr CgroupTree::host() {
  return lookUp(kRootName);
}

GroupPtr CgroupTree::lookUpKnown(std::string_view path) {
  if (path.size() >= PATH_MAX) return {};
  const auto known = paths_.find(std::string(path));
  if (known == paths_.end()) return {};
  const auto open = groups_.find(known->second);
  Identity identity;
  if (open != groups_.end() &&
      identify(hierarchy_.directory.get(), known->first.c_str(), identity) == 0 &&
      identity.id == known->second && identity.mount == mount_) {
    open->second->lastUse = ++uses_;
    return open->second;
  }
  paths_.erase(known);
  return {};
}

// A path longer than Linux takes in one call is looked up component by component every time.
void CgroupTree::remember(std::string_view path, GroupId id) {
  if (path.size() >= PATH_MAX) return;
  if (paths_.size() >= kMaxKnownPaths) paths_.clear();
  paths_[std::string(path)] = id;
}

// Host cannot be deleted while a group is below it. So a group that was opened below this host is
// still below it, or was deleted.
void CgroupTree::takeHost(GroupId id) {
  if (id == hostId_) return;
  groups_.clear();
  paths_.clear();
  hostId_ = id;
}

GroupId CgroupTree::requireHost() {
  if (hostId_ == 0 && !host()) noSuchGroup();
  return hostId_;
}

GroupPtr CgroupTree::find(GroupId id) {
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
  // Linux reports EINVAL for an id that it can never have given to a group.
  if (error == EINVAL || statusOf(error) == Status::kNotFound) noSuchGroup();
  fail(error, "cannot open group " + std::to_string(id));
}

// An id is valid on the whole machine, but only host and the groups below it belong to the tree.
GroupPtr CgroupTree::findUpwards(UniqueFd directory, GroupId id) {
  (void)requireHost();
  GroupPtr group = adopt(std::move(directory), id);
  try {
    for (GroupPtr at = group; at->id != hostId_; at = parentOf(*at)) {
    }
  } catch (const KernelError &) {
    groups_.clear();  // it holds groups of other trees now
    throw;
  }
  return group;
}

// Without the right to open by id.
GroupPtr CgroupTree::findByWalking(GroupId id) {
  if (id == requireHost()) return host();
  std::vector<std::string> paths = {std::string(kRootName)};
  while (!paths.empty()) {
    const std::string path = std::move(paths.back());
    paths.pop_back();
    Group group;
    if (openBeneath(hierarchy_.directory.get(), path, group.directory) != 0) continue;
    for (const Child &child : readChildren(group.fd())) {
      paths.push_back(path + "/" + child.name);
      if (child.id != id) continue;
      if (GroupPtr found = lookUp(paths.back()); found && found->id == id) return found;
      noSuchGroup();
    }
  }
  noSuchGroup();
}

GroupPtr CgroupTree::parentOf(Group &group) {
  if (group.id == requireHost()) return {};
  if (group.parent != 0) return find(group.parent);
  UniqueFd directory(::openat(group.fd(), "..", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!directory) fail(errno, "cannot open the parent group");
  Identity identity;
  if (const int error = identify(directory.get(), "", identity); error != 0) {
    fail(error, "cannot identify the parent group");
  }
  if (identity.mount != mount_) noSuchGroup();  // ".." of the mount's own root
  group.parent = identity.id;
  return adopt(std::move(directory), identity.id);
}

GroupPtr CgroupTree::adopt(UniqueFd directory, GroupId id) {
  if (const auto known = groups_.find(id); known != groups_.end()) {
    known->second->lastUse = ++uses_;
    return known->second;
  }
  if (groups_.size() >= kMaxOpenGroups) closeLeastUsed();
  auto group = std::make_shared<Group>();
  group->id = id;
  group->directory = std::move(directory);
  group->lastUse = ++uses_;
  groups_[id] = group;
  return group;
}

// Groups that a caller still uses stay open.
void CgroupTree::closeLeastUsed() {
  auto least = groups_.end();
  for (auto at = groups_.begin(); at != groups_.end(); ++at) {
    if (at->second.use_count() > 1) continue;
    if (least == groups_.end() || at->second->lastUse < least->second->lastUse) least = at;
  }
  if (least != groups_.end()) groups_.erase(least);
}

GroupPtr CgroupTree::makeHost() {
  enableControllersOfHost();
  (void)makeIn(hierarchy_.directory.get(), kRootName);
  return host();
}

// The controllers are enabled first: a process that is killed in between must not leave a group
// that has none.
GroupPtr CgroupTree::make(Group &parent, std::string_view name) {
  if (!hasChildren(parent)) enableControllersBelow(parent);
  GroupPtr group;
  try {
    group = makeIn(parent.fd(), name);
    group->parent = parent.id;
    // Another program may have disabled them.
    if (!hasControllers(*group)) enableControllersBelow(parent);
    return group;
  } catch (const KernelError &) {
    // The first error counts.
    if (group) (void)::unlinkat(parent.fd(), group->name.c_str(), AT_REMOVEDIR);
    if (group) groups_.erase(group->id);
    disableControllersBelow(parent);
    throw;
  }
}

GroupPtr CgroupTree::makeIn(int parent, std::string_view name) {
  const std::string text(name);
  if (::mkdirat(parent, text.c_str(), kDirectoryMode) != 0) fail(errno, "cannot make " + text);
  UniqueFd directory;
  Identity identity;
  if (const int error = openGroup(parent, text, directory, identity); error != 0) {
    (void)::unlinkat(parent, text.c_str(), AT_REMOVEDIR);  // the first error counts
    fail(error, "cannot open " + text);
  }
  GroupPtr group = adopt(std::move(directory), identity.id);
  group->name = text;
  return group;
}

void CgroupTree::remove(Group &group, Group &parent) {
  const std::string &name = nameOf(group);
  Identity identity;
  if (identify(parent.fd(), name.c_str(), identity) != 0 || identity.id != group.id) {
    groups_.erase(group.id);
    noSuchGroup();
  }
  if (::unlinkat(parent.fd(), name.c_str(), AT_REMOVEDIR) != 0) {
    fail(errno, "cannot remove " + name);
  }
  groups_.erase(group.id);
  disableControllersBelow(parent);
}

const std::string &CgroupTree::nameOf(Group &group) {
  if (!group.name.empty()) return group.name;
  std::array<char, PATH_MAX> target;
  const std::string link = "/proc/self/fd/" + std::to_string(group.fd());
  const ssize_t size = ::readlink(link.c_str(), target.data(), target.size());
  if (size < 0) fail(errno, "cannot read the name of group " + std::to_string(group.id));
  group.name = lastComponent({target.data(), static_cast<size_t>(size)});
  return group.name;
}

std::string CgroupTree::pathOf(Group &group) {
  std::string path = nameOf(group);
  for (GroupPtr above = parentOf(group); above; above = parentOf(*above)) {
    path = nameOf(*above) + "/" + path;
  }
  return path;
}

std::vector<Child> CgroupTree::besideHost() const {
  std::vector<Child> groups = readChildren(hierarchy_.directory.get());
  groups.erase(std::remove_if(groups.begin(), groups.end(),
                              [](const Child &group) { return group.name == kRootName; }),
               groups.end());
  return groups;
}

bool CgroupTree::hasChildren(const Group &group) const {
  struct stat status {};
  if (::fstat(group.fd(), &status) != 0) fail(errno, "cannot examine the group's directory");
  return status.st_nlink > kLinksOfALeaf;
}

// The directory of a deleted group keeps its attributes, but has no files any more.
void CgroupTree::requireAlive(const Group &group) const {
  if (!hasControl(group.fd(), kMembersFile)) noSuchGroup();
}

bool CgroupTree::isPopulated(const Group &group) const {
  return keyedValue(readControl(group.fd(), kEventsFile), "populated").value_or(1) != 0;
}

void CgroupTree::addMember(Group &group, int64_t pid) {
  // 0 would be this process itself.
  if (pid <= 0 || pid > std::numeric_limits<int32_t>::max()) {
    throw KernelError(Status::kNotFound, "no such process");
  }
  const std::string text = std::to_string(pid);
  int error = writeControl(group.fd(), kMembersFile, text);
  if (error == EBUSY) {
    // The controllers below it are still enabled, although its last child group is gone.
    disableControllersBelow(group);
    error = writeControl(group.fd(), kMembersFile, text);
  }
  if (error != 0) fail(error, "cannot move process " + text);
  // Linux accepts a zombie and leaves it where it is.
  if (!isAlive(pid)) throw KernelError(Status::kNotFound, "no such process");
}

// The path in /proc begins at the root of the cgroup namespace, which need not be the mount's. So
// the part from host on is looked up, and the members of that group decide.
GroupPtr CgroupTree::groupOf(int64_t pid) {
  const std::string text = procText(pid, "cgroup");
  const size_t line = text.rfind("0::/");
  const size_t slash =
      line == std::string::npos ? line : text.find("/" + std::string(kRootName), line);
  if (slash == std::string::npos) return {};
  const std::string path = text.substr(slash + 1, text.find('\n', slash) - slash - 1);
  GroupPtr group = splitPath(path) ? lookUp(path) : GroupPtr();
  if (!group) return {};
  const std::vector<int64_t> pids = readMembers(group->fd());
  return std::find(pids.begin(), pids.end(), pid) == pids.end() ? GroupPtr() : group;
}

void CgroupTree::write(Group &group, Control control, std::string_view text) {
  const char *name = infoOf(control).name;
  int error = writeControl(group.fd(), name, text);
  if (error == ENOENT) {
    requireAlive(group);
    enableControllersIn(group);
    error = writeControl(group.fd(), name, text);
  }
  if (error == 0) return;
  fail(error, std::string("cannot write \"") + std::string(text) + "\" to " + name + " of " +
                  nameOf(group));
}

void CgroupTree::enableControllersIn(Group &group) {
  if (const GroupPtr parent = parentOf(group)) return enableControllersBelow(*parent);
  enableControllersOfHost();
}

void CgroupTree::enableControllersOfHost() {
  const int error = writeControl(hierarchy_.directory.get(), kSubtreeFile, kEnable);
  if (error != 0) fail(error, "cannot enable memory and cpu below " + hierarchy_.path);
}

void CgroupTree::enableControllersBelow(Group &group) {
  int error = writeControl(group.fd(), kSubtreeFile, kEnable);
  if (error == ENOENT) {  // the group has not got them itself
    enableControllersIn(group);
    error = writeControl(group.fd(), kSubtreeFile, kEnable);
  }
  if (error != 0) fail(error, "cannot enable memory and cpu below " + nameOf(group));
}

// So that a group without child groups takes processes. A failure is not an error: a process that
// joins makes another attempt.
void CgroupTree::disableControllersBelow(const Group &group) const noexcept {
  struct stat status {};
  if (::fstat(group.fd(), &status) != 0 || status.st_nlink > kLinksOfALeaf) return;
  (void)writeControl(group.fd(), kSubtreeFile, kDisable);
}

}  // namespace Knob::Linux
