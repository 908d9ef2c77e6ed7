// SPDX-License-Identifier: Apache-2.0
// posix_spawn uses vfork, so the size of the measuring process does not matter.
#include "child_process.h"

#include <fcntl.h>
#include <spawn.h>
#include <sys/resource.h>
#include <sys/time.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <stdexcept>

extern char **environ;

namespace Bench {
namespace {

class SpawnActions {
 public:
  SpawnActions() {
    posix_spawn_file_actions_init(&actions_);
    posix_spawn_file_actions_addopen(&actions_, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
  }
  ~SpawnActions() { posix_spawn_file_actions_destroy(&actions_); }
  SpawnActions(const SpawnActions &) = delete;
  SpawnActions &operator=(const SpawnActions &) = delete;
  const posix_spawn_file_actions_t *get() const { return &actions_; }

 private:
  posix_spawn_file_actions_t actions_;
};

double microseconds(const timeval &time) {
  return static_cast<double>(time.tv_sec) * 1e6 + static_cast<double>(time.tv_usec);
}

}  // namespace

Cost runProgram(const std::vector<std::string> &commandLine) {
  std::vector<char *> arguments;
  for (const std::string &word : commandLine) {
    arguments.push_back(const_cast<char *>(word.c_str()));
  }
  arguments.push_back(nullptr);
  const SpawnActions actions;

  const auto start = std::chrono::steady_clock::now();
  pid_t child = 0;
  const int failure =
      posix_spawn(&child, arguments[0], actions.get(), nullptr, arguments.data(), environ);
  if (failure != 0) {
    throw std::runtime_error(commandLine[0] + ": " + std::strerror(failure));
  }
  int status = 0;
  rusage usage{};
  while (wait4(child, &status, 0, &usage) < 0) {
    if (errno != EINTR) {
      throw std::runtime_error(std::string("wait4: ") + std::strerror(errno));
    }
  }
  const auto end = std::chrono::steady_clock::now();
  if (!WIFEXITED(status) || WEXITSTATUS(status) != 0) {
    throw std::runtime_error(commandLine[0] + " " + commandLine[1] + " failed");
  }
  Cost cost;
  cost.wallMicroseconds = std::chrono::duration<double, std::micro>(end - start).count();
  cost.cpuMicroseconds = microseconds(usage.ru_utime) + microseconds(usage.ru_stime);
  cost.peakKB = static_cast<double>(usage.ru_maxrss);
  return cost;
}

}  // namespace Bench
