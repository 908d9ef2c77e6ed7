// SPDX-License-Identifier: Apache-2.0
// The lock that keeps two runs of poolctl-install from changing the definition folder at once.
#pragma once

#include "common/unique_fd.h"
#include "signal_guard.h"

namespace Install {

class FolderLock {
 public:
  // FOLDER: its open descriptor, which must outlive the lock. Waits up to 60 s for another run to
  // end. Throws std::system_error, Tools::Failure when the other run does not end, or Interrupted.
  FolderLock(int folder, const SignalGuard &signals);
  ~FolderLock();
  FolderLock(const FolderLock &) = delete;
  FolderLock &operator=(const FolderLock &) = delete;

 private:
  bool tryToLock();

  const int folder_;
  Platform::UniqueFd file_;
};

}  // namespace Install
