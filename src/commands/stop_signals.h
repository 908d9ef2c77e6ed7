// SPDX-License-Identifier: Apache-2.0
// Signals that end a command between two pools and never within one, so that no pool is left half
// done.
#pragma once

#include <signal.h>

namespace Commands {

// A reader of the program's messages that goes away must not end a command between two kernel
// calls.
void ignoreBrokenPipes() noexcept;

// Blocks SIGINT, SIGTERM and SIGHUP until the process ends, except those that were ignored or
// blocked when it started. One object in a process.
class StopSignals {
 public:
  StopSignals() noexcept;
  StopSignals(const StopSignals &) = delete;
  StopSignals &operator=(const StopSignals &) = delete;

  // Whether a signal has arrived since the last call. Several that arrived together count as one.
  // Prints "stopped by " and the name of the first.
  bool poll() noexcept;

  // The signal that arrived first; 0: none yet.
  int first() const noexcept { return first_; }

  // Ends the process by the first signal.
  [[noreturn]] void endProcess() noexcept;

  // Ends the process if a signal has arrived.
  void endIfStopped() noexcept {
    if (poll()) endProcess();
  }

 private:
  void take(int signal) noexcept;

  sigset_t watched_;
  int first_ = 0;
};

}  // namespace Commands
