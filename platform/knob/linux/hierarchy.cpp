// SPDX-License-Identifier: Apache-2.0
// Each reason is one sentence: what is missing, then what to do.
#include "knob/linux/hierarchy.h"

#include <fcntl.h>
#include <linux/magic.h>
#include <sys/vfs.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <optional>
#include <system_error>

#include "common/read_file.h"
#include "knob/linux/beneath.h"
#include "knob/linux/cgroup_files.h"
#include "knob/linux/control_values.h"

namespace Knob::Linux {
namespace {

using Platform::UniqueFd;

constexpr const char *kMountInfoFile = "/proc/self/mountinfo";
constexpr size_t kMaxMountInfoBytes = size_t{16} * 1024 * 1024;
constexpr const char *kUnifiedBoot =
    "boot with systemd.unified_cgroup_hierarchy=1, or with cgroup_no_v1=all";

// A line of mountinfo: ID PARENT MAJOR:MINOR ROOT POINT OPTIONS [OPTIONAL...] - TYPE SOURCE
// SUPEROPTIONS. In a field a blank or backslash is a backslash and three octal digits.
constexpr size_t kIdField = 0, kRootField = 3, kPointField = 4, kOptionsField = 5;
// After the lone "-": type, source, super options.
constexpr size_t kTypeField = 1, kSuperOptionsField = 3;

std::vector<std::string_view> split(std::string_view text, char separator) {
  std::vector<std::string_view> parts;
  for (size_t start = 0; start <= text.size();) {
    const size_t end = std::min(text.find(separator, start), text.size());
    if (end > start) parts.push_back(text.substr(start, end - start));
    start = end + 1;
  }
  return parts;
}

bool isOctal(char c) {
  return c >= '0' && c <= '7';
}

std::string unescaped(std::string_view field) {
  std::string text;
  for (size_t at = 0; at < field.size(); ++at) {
    const std::string_view digits = field.substr(at + 1, 3);
    if (field[at] == '\\' && digits.size() == 3 &&
        std::all_of(digits.begin(), digits.end(), isOctal)) {
      text += static_cast<char>((digits[0] - '0') * 64 + (digits[1] - '0') * 8 + digits[2] - '0');
      at += 3;
    } else {
      text += field[at];
    }
  }
  return text;
}

bool hasOption(std::string_view options, std::string_view option) {
  const auto all = split(options, ',');
  return std::find(all.begin(), all.end(), option) != all.end();
}

std::optional<int> number(std::string_view digits) {
  int value = 0;
  const auto [stop, error] = std::from_chars(digits.data(), digits.data() + digits.size(), value);
  if (error != std::errc() || stop != digits.data() + digits.size()) return std::nullopt;
  return value;
}

void addLine(CgroupMounts &mounts, std::string_view line) {
  const std::vector<std::string_view> fields = split(line, ' ');
  const auto dash = std::find(fields.begin(), fields.end(), "-");
  const auto before = static_cast<size_t>(dash - fields.begin());
  if (before <= kOptionsField || fields.size() - before <= kSuperOptionsField) return;

  const std::string_view type = dash[kTypeField], superOptions = dash[kSuperOptionsField];
  if (type == "cgroup") {
    for (std::string_view option : split(superOptions, ',')) {
      mounts.legacyControllers.emplace_back(option);
    }
  }
  const std::optional<int> id = number(fields[kIdField]);
  if (type != "cgroup2" || !id) return;
  mounts.unified.push_back({*id, unescaped(fields[kRootField]), unescaped(fields[kPointField]),
                            hasOption(fields[kOptionsField], "ro") || hasOption(superOptions, "ro"),
                            hasOption(superOptions, "memory_recursiveprot")});
}

[[noreturn]] void notUsable(const std::string &reason) {
  throw KernelError(Status::kKernelNotUsable, reason);
}

std::string systemText(int error) {
  return std::generic_category().message(error);
}

CgroupMounts readMounts() {
  try {
    return parseMountInfo(Platform::readFile(kMountInfoFile, kMaxMountInfoBytes));
  } catch (const std::system_error &error) {
    notUsable(std::string("cannot read ") + kMountInfoFile + ": " +
              systemText(error.code().value()) + "; mount proc on /proc");
  }
}

// Nothing when another mount hides it.
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

// All of them show the same hierarchy. One that shows the whole is better than one that shows a
// part, and a writable one better than a read-only one.
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
            " cannot be opened: it is hidden by another mount, or you may not read it");
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

bool isInOldHierarchy(const CgroupMounts &mounts, const std::string &controller) {
  const auto &legacy = mounts.legacyControllers;
  return std::find(legacy.begin(), legacy.end(), controller) != legacy.end();
}

// In the root of the whole hierarchy a controller is missing because the old hierarchy has it, or
// because the kernel does not offer it; below, because the group above does not enable it.
std::string whyMissing(const std::string &controller, const CgroupMounts &mounts,
                       const std::string &folder, bool isTop) {
  if (isInOldHierarchy(mounts, controller)) {
    return "the " + controller + " controller belongs to the old cgroup hierarchy; " + kUnifiedBoot;
  }
  if (isTop) {
    return "this kernel offers no " + controller + " controller to cgroup2 (" + folder +
           "); boot without cgroup_disable=" + controller +
           " and without cgroup_no_v1 or v1 mounts "
           "that name it, or use a kernel built with it";
  }
  return "the " + controller + " controller is not enabled in " + folder + "; write +" +
         controller +
         " to the cgroup.subtree_control of the group above it (in a systemd service: "
         "Delegate=memory cpu)";
}

bool isTopOfHierarchy(int directory) {
  // It is the only group without this file.
  return !readControlIfAny(directory, "cgroup.type").has_value();
}

}  // namespace

CgroupMounts parseMountInfo(std::string_view text) {
  CgroupMounts mounts;
  for (std::string_view line : split(text, '\n')) addLine(mounts, line);
  return mounts;
}

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
  Hierarchy hierarchy{std::move(found.directory), found.mount.point,
                      found.mount.protectsRecursively};

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
