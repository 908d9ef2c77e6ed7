// SPDX-License-Identifier: Apache-2.0
// A process that lives in a group and does there what a test wants: nothing, hold memory, read a
// file, be busy.
#pragma once

#include <sys/types.h>

#include <cstddef>
#include <functional>
#include <string>

namespace Uml {

class Worker {
 public:
  // Starts a process that enters the group, does the work once and then waits for its end.
  Worker(const std::string &group, const std::function<void()> &work);
  Worker(const Worker &) = delete;
  Worker &operator=(const Worker &) = delete;
  ~Worker();

  // Waits until the work is done. False: the process ended before, or a minute has passed.
  bool waitUntilDone();

  pid_t pid() const { return pid_; }
  bool alive();

  // Ends the process and waits for it.
  void end();

 private:
  pid_t pid_ = -1;
  int done_ = -1;
};

void doNothing();

// Memory that the kernel cannot take back while the process lives.
std::function<void()> holdMB(size_t megabytes);

// Brings a file into the page cache, as often as wanted.
std::function<void()> readThrough(const std::string &file, int times = 1);

// Uses all the CPU time that it gets, without end.
void beBusy();

}  // namespace Uml
