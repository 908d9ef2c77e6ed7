// SPDX-License-Identifier: Apache-2.0
// flock has no time limit of its own, so it is tried again and again.
#include "knob/linux/tree_lock.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <sstream>
#include <string>
#include <system_error>
#include <thread>

#include "common/read_file.h"
#include "knob/linux/cgroup_files.h"

namespace Knob::Linux {
namespace {

using Platform::UniqueFd;
using std::chrono::milliseconds;
using std::chrono::steady_clock;

// The files that have no mode bits for others: since Linux 5.14 and 5.19. Opening them changes
// nothing.
constexpr const char *kLockFiles[] = {"cgroup.kill", kMemoryReclaimFile};
constexpr milliseconds kFirstPause{1}, kMaxPause{20};
constexpr size_t kMaxLocksBytes = size_t{4} * 1024 * 1024;
constexpr size_t kMaxNameBytes = 64;

// Returns 0 or the errno.
int openLockFile(int hostDirectory, UniqueFd &file) {
  for (const char *name : kLockFiles) {
    file = UniqueFd(::openat(hostDirectory, name, O_WRONLY | O_CLOEXEC | O_NOFOLLOW));
    if (file) return 0;
    if (errno != ENOENT) return errno;
  }
  // An older kernel. The deadline still holds there.
  file = UniqueFd(::openat(hostDirectory, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return file ? 0 : errno;
}

std::string textOf(const std::string &path, size_t maxBytes) {
  try {
    return Platform::readFile(path, maxBytes);
  } catch (const std::system_error &) {
    return {};
  }
}

// "process 123 (poolctl)"; Linux lists the locks of all processes with device and inode.
std::string holderOf(int file) {
  struct stat status {};
  if (::fstat(file, &status) != 0) return "another process";
  std::array<char, 64> identity;
  (void)std::snprintf(identity.data(), identity.size(), "%02x:%02x:%llu", major(status.st_dev),
                      minor(status.st_dev), static_cast<unsigned long long>(status.st_ino));
  std::istringstream lines(textOf("/proc/locks", kMaxLocksBytes));
  for (std::string line; std::getline(lines, line);) {
    std::istringstream fields(line);
    std::string number, type, mode, access, pid, where;
    fields >> number >> type >> mode >> access >> pid >> where;
    if (type != "FLOCK" || where != identity.data()) continue;
    std::string name = textOf("/proc/" + pid + "/comm", kMaxNameBytes);
    name.erase(std::find(name.begin(), name.end(), '\n'), name.end());
    return "process " + pid + (name.empty() ? "" : " (" + name + ")");
  }
  return "another process";
}

}  // namespace

TreeLock::TreeLock(int hostDirectory, Kind kind, milliseconds deadline) {
  const int error = openLockFile(hostDirectory, file_);
  if (error == EACCES || error == EPERM) {
    if (kind == Kind::kShared) return;
    throw KernelError(Status::kPermissionDenied, "only the owner of host may change groups");
  }
  if (error != 0) fail(error, "cannot lock the groups");

  const int operation = (kind == Kind::kShared ? LOCK_SH : LOCK_EX) | LOCK_NB;
  const auto end = steady_clock::now() + deadline;
  for (milliseconds pause = kFirstPause; ::flock(file_.get(), operation) != 0;) {
    if (errno != EWOULDBLOCK && errno != EINTR) fail(errno, "cannot lock the groups");
    if (steady_clock::now() >= end) {
      throw KernelError(Status::kFailure, "the groups have been locked by " +
                                              holderOf(file_.get()) + " for " +
                                              std::to_string(deadline.count() / 1000) + " s");
    }
    std::this_thread::sleep_for(pause);
    pause = std::min(2 * pause, kMaxPause);
  }
}

}  // namespace Knob::Linux
