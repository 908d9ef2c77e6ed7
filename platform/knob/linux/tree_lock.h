// SPDX-License-Identifier: Apache-2.0
// The lock on the tree. Writers exclude all others; readers that must see several groups at one
// moment exclude writers.
//
// It is a flock on a file of host that only its owner can open. On a file that others can read, any
// user could hold it and stop every command.
#pragma once

#include <chrono>

#include "common/unique_fd.h"

namespace Knob::Linux {

class TreeLock {
 public:
  enum class Kind { kShared, kExclusive };

  static constexpr std::chrono::milliseconds kDeadline{20000};

  // Waits for the lock, at most until the deadline. A process that may not open the file gets no
  // shared lock: it sees each group as it was at some moment, but not all at the same one. Throws
  // KernelError: permission denied (exclusive), failure (the deadline has passed; the message names
  // the holder).
  TreeLock(int hostDirectory, Kind kind, std::chrono::milliseconds deadline = kDeadline);

 private:
  Platform::UniqueFd file_;  // closing it releases the lock
};

}  // namespace Knob::Linux
