// SPDX-License-Identifier: Apache-2.0
// A file of its own that only its owner can open: any user can lock a folder that is readable for
// all, and could make every run wait.
#include "folder_lock.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <string>
#include <thread>

#include "files.h"
#include "loader/definition_files.h"
#include "shared/tool.h"

namespace Install {
namespace {

constexpr const char *kLockName = ".install.lock";
constexpr std::chrono::seconds kPatience{60};
constexpr std::chrono::milliseconds kPause{20};

}  // namespace

FolderLock::FolderLock(int folder, const SignalGuard &signals) : folder_(folder) {
  const auto end = std::chrono::steady_clock::now() + kPatience;
  while (!tryToLock()) {
    signals.check();
    if (std::chrono::steady_clock::now() >= end) {
      throw Tools::Failure(Tools::kExitBusy, std::string(Loader::kDefinitionFolder) +
                                                 ": busy: another poolctl-install is running");
    }
    std::this_thread::sleep_for(kPause);
  }
}

FolderLock::~FolderLock() {
  (void)unlinkat(folder_, kLockName, 0);
}

// The holder removes the file when it ends, and a lock on a removed file protects nothing. So the
// lock counts only if the file still has its name.
bool FolderLock::tryToLock() {
  const std::string path = std::string(Loader::kDefinitionFolder) + "/" + kLockName;
  file_ = Platform::UniqueFd(
      openat(folder_, kLockName, O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC, S_IRUSR | S_IWUSR));
  if (!file_) throwSystemError(path);
  if (flock(file_.get(), LOCK_EX | LOCK_NB) != 0) {
    if (errno != EWOULDBLOCK && errno != EINTR) throwSystemError(path);
    return false;
  }
  struct stat named {
  }, locked{};
  return fstatat(folder_, kLockName, &named, AT_SYMLINK_NOFOLLOW) == 0 &&
         fstat(file_.get(), &locked) == 0 && named.st_ino == locked.st_ino &&
         named.st_dev == locked.st_dev;
}

}  // namespace Install
