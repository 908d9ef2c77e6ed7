// SPDX-License-Identifier: Apache-2.0
// Every reason stands alone: what is missing, then how to mend it.
#include "knob/linux/hierarchy.h"

#include <fcntl.h>
#include <linux/magic.h>
#include <sys/vfs.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <system_error>

#include "common/read_file.h"
#include "knob/linux/beneath.h"
#include "knob/linux/cgroup_files.h"
#include "knob/linux/control_values.h"

namespace Knob::Linux {
namespace {

using Platform::UniqueFd;

constexpr const char *kMountInfoFile = "/proc/self/mountinfo";
constexpr size_t kMostMountInfoBytes = size_t{16} * 1024 * 1024;
constexpr const char *kUnifiedBoot =
    "boot with systemd.unified_cgroup_hierarchy=1, or with cgroup_no_v1=all";

[[noreturn]] void notUsable(const std::string &reason) {
  throw KernelError(Status::kKernelNotUsable, reason);
}

std::string systemText(int error) {
  return std::generic_category().message(error);
}

CgroupMounts readMounts() {
  try {
    return parseMountInfo(Platform::readFile(kMountInfoFile, kMostMountInfoBytes));
  } catch (const std::system_error &error) {
    notUsable(std::string("cannot read ") + kMountInfoFile + ": " +
              systemText(error.code().value()) + "; mount proc on /proc");
  }
}

// A mount that another one hides is not reached through its path.
UniqueFd openMount(const CgroupMount &mount) {
  UniqueFd directory(::open(mount.point.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  struct statfs status {};
  if (!directory || ::fstatfs(directory.get(), &status) != 0 ||
      static_cast<unsigned long>(status.f_type) != CGROUP2_SUPER_MAGIC) {
    return {};
  }
  return directory;
}

struct OpenMount {
  UniqueFd directory;
  CgroupMount mount;
};

// All of them show one hierarchy. The whole is better than a part of it, and one that can be
// written better than one that cannot.
OpenMount openBestMount(const CgroupMounts &mounts) {
  const auto rank = [](const CgroupMount &mount) {
    return (mount.root == "/" ? 2 : 0) + (mount.readOnly ? 0 : 1);
  };
  OpenMount best;
  for (const CgroupMount &mount : mounts.unified) {
    if (best.directory && rank(mount) <= rank(best.mount)) continue;
    if (UniqueFd directory = openMount(mount)) best = {std::move(directory), mount};
  }
  if (best.directory) return best;
  if (mounts.unified.empty()) {
    notUsable(std::string("no cgroup2 file system is mounted; ") + kUnifiedBoot +
              ", or mount -t cgroup2 none /sys/fs/cgroup");
  }
  const CgroupMount &first = mounts.unified.front();
  notUsable("the cgroup2 mount at " + first.point +
            " cannot be opened: it is hidden by another mount, or there is no right to it");
}

std::string withoutSlashes(const std::string &path) {
  const size_t first = path.find_first_not_of('/');
  if (first == std::string::npos) return {};
  return path.substr(first, path.find_last_not_of('/') - first + 1);
}

UniqueFd openFolder(int mountDirectory, const std::string &folder, const std::string &path) {
  UniqueFd directory;
  const int error = openBeneath(mountDirectory, folder, directory);
  if (error == 0) return directory;
  const std::string start = "cgroup-root: " + path + ": " + systemText(error);
  if (error == ENOENT || error == ENOTDIR) {
    notUsable(start + "; make this group first, or name another in knob.conf");
  }
  notUsable(start);
}

bool isHeldByOldHierarchy(const CgroupMounts &mounts, const std::string &controller) {
  const auto &held = mounts.legacyControllers;
  return std::find(held.begin(), held.end(), controller) != held.end();
}

// In the root of the whole hierarchy a controller is missing because somebody else has it, or
// because the kernel does not offer it; below, because the group above does not pass it on.
std::string whyMissing(const std::string &controller, const CgroupMounts &mounts,
                       const std::string &folder, bool isTop) {
  if (isHeldByOldHierarchy(mounts, controller)) {
    return "the " + controller + " controller is held by the old cgroup hierarchy; " + kUnifiedBoot;
  }
  if (isTop) {
    return "this kernel offers no " + controller + " controller to cgroup2 (" + folder +
           "); boot without cgroup_disable=" + controller +
           " and without cgroup_no_v1 or v1 mounts "
           "that name it, or use a kernel built with it";
  }
  return "the " + controller + " controller is not passed on to " + folder + "; write +" +
         controller +
         " to the cgroup.subtree_control of the group above it (in a systemd service: "
         "Delegate=memory cpu)";
}

bool isTopOfHierarchy(int directory) {
  // The one group that has no type and no limits of its own.
  return !readControlIfAny(directory, "cgroup.type").has_value();
}

}  // namespace

std::string missingControllers(const std::string &controllers, const CgroupMounts &mounts,
                               const std::string &folder, bool isTop) {
  std::string reasons;
  for (const char *controller : {"memory", "cpu"}) {
    if (hasWord(controllers, controller)) continue;
    if (!reasons.empty()) reasons += "; ";
    reasons += whyMissing(controller, mounts, folder, isTop);
  }
  return reasons;
}

Hierarchy openHierarchy(const Configuration &configuration) {
  const CgroupMounts mounts = readMounts();
  OpenMount found = openBestMount(mounts);
  Hierarchy hierarchy{std::move(found.directory), found.mount.point};

  const std::string folder = withoutSlashes(configuration.cgroupRoot);
  if (!folder.empty()) {
    hierarchy.path += "/" + folder;
    hierarchy.directory = openFolder(hierarchy.directory.get(), folder, hierarchy.path);
  }
  const int directory = hierarchy.directory.get();
  const std::string reasons = missingControllers(readControl(directory, kControllersFile), mounts,
                                                 hierarchy.path, isTopOfHierarchy(directory));
  if (!reasons.empty()) notUsable(reasons);
  if (found.mount.readOnly) {
    notUsable("the cgroup2 mount at " + found.mount.point + " is read-only; mount -o remount,rw " +
              found.mount.point);
  }
  return hierarchy;
}

}  // namespace Knob::Linux
