// SPDX-License-Identifier: Apache-2.0
// Processes that want all of a machine: what a pool has to be kept apart from. They live in control
// groups of their own, below one at the top of the tree, and start again when the kernel kills
// them.
#pragma once

#include <sys/types.h>

#include <filesystem>
#include <functional>
#include <vector>

namespace Bench {

class Hogs {
 public:
  // Five kinds: one that grows without end, one that reads a file larger than memory, one that
  // writes a file without pause, one that forks processes that stay, and two that only compute.
  // work: a folder for their files, on a disk of 256 MB or more. name: their group at the top of
  // the tree. Throws std::system_error.
  Hogs(const std::filesystem::path &work, const char *name);
  Hogs(const Hogs &) = delete;
  Hogs &operator=(const Hogs &) = delete;

  // Kills them, with all else that lives in their group, and removes their groups.
  ~Hogs();

  // Starts those anew that have ended. To be called again and again.
  void restartEnded();

 private:
  struct Hog {
    std::filesystem::path group;
    std::function<void()> work;
    pid_t pid;
  };

  void add(const char *name, const std::function<void()> &work);
  static pid_t start(const Hog &hog);

  std::filesystem::path top_;
  std::vector<Hog> hogs_;
};

// How many processes the kernel has killed for want of memory since the machine started.
long machineWideKills();

}  // namespace Bench
