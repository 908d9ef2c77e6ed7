// SPDX-License-Identifier: Apache-2.0
// A process that lives and holds as much memory as ordered, until the case ends it.
#pragma once

#include <sys/types.h>

#include <cstddef>

namespace Contract {

class HeldProcess {
 public:
  HeldProcess();
  HeldProcess(const HeldProcess &) = delete;
  HeldProcess &operator=(const HeldProcess &) = delete;
  ~HeldProcess();

  pid_t pid() const { return pid_; }

  // Returns once the process has touched that much memory. What it held before its group was
  // changed may be counted where it was then.
  void hold(size_t memoryMB);

  // Ends it, and waits until it is a zombie; its id stays taken.
  void endButDoNotReap();
  // Ends it for good.
  void end();

 private:
  pid_t pid_ = -1;
  int orders_ = -1, answers_ = -1;  // the ends of two pipes
};

}  // namespace Contract
