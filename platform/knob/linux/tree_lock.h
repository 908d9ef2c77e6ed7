// SPDX-License-Identifier: Apache-2.0
// The lock on the tree: flock on host's directory, taken and given back by scope. Writers exclude
// everybody; readers that must see several groups at one moment exclude writers.
#pragma once

#include <sys/file.h>

#include <cerrno>

#include "knob/linux/errno_status.h"

namespace Knob::Linux {

class TreeLock {
 public:
  enum class Kind { kShared = LOCK_SH, kExclusive = LOCK_EX };

  // hostDirectory: outlives the lock. Waits for the others.
  TreeLock(int hostDirectory, Kind kind) : directory_(hostDirectory) {
    while (::flock(directory_, static_cast<int>(kind)) != 0) {
      if (errno != EINTR) fail(errno, "cannot lock the tree");
    }
  }
  ~TreeLock() { (void)::flock(directory_, LOCK_UN); }  // fails only without a lock
  TreeLock(const TreeLock &) = delete;
  TreeLock &operator=(const TreeLock &) = delete;

 private:
  const int directory_;
};

}  // namespace Knob::Linux
