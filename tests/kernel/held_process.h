// A process that lives, and holds memory, until the case lets it go.
#pragma once

#include <sys/types.h>

#include <cstddef>

namespace Contract {

class HeldProcess {
 public:
  // Returns once the process has touched that much memory.
  explicit HeldProcess(size_t memoryMB = 0);
  HeldProcess(const HeldProcess &) = delete;
  HeldProcess &operator=(const HeldProcess &) = delete;
  ~HeldProcess();

  pid_t pid() const { return pid_; }

  // Ends it, and waits until it is a zombie; its id stays taken.
  void endButDoNotReap();
  // Ends it for good.
  void end();

 private:
  pid_t pid_ = -1;
};

}  // namespace Contract
