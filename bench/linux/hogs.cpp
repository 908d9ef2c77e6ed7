// SPDX-License-Identifier: Apache-2.0
#include "hogs.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/sysinfo.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <fstream>
#include <string>
#include <system_error>

#include "pools.h"

namespace Bench {
namespace {

namespace fs = std::filesystem;

constexpr std::size_t kMiB = std::size_t{1} << 20;

// The child of a killed hog must not stay behind.
void endWithParent() {
  prctl(PR_SET_PDEATHSIG, SIGKILL);
}

void touch(std::size_t bytes) {
  void *memory = mmap(nullptr, bytes, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  if (memory != MAP_FAILED) std::memset(memory, 1, bytes);
}

void growWithoutEnd() {
  for (;;) touch(kMiB);
}

void readWithoutEnd(const fs::path &file) {
  static char buffer[1 << 16];
  const int descriptor = open(file.c_str(), O_RDONLY | O_CLOEXEC);
  for (off_t at = 0;;) {
    const ssize_t count = pread(descriptor, buffer, sizeof buffer, at);
    if (count < 0) _exit(1);
    at = count == 0 ? 0 : at + count;
  }
}

void writeWithoutEnd(const fs::path &file) {
  static char buffer[1 << 16];
  constexpr off_t kSize = 128 * off_t{kMiB};
  const int descriptor = open(file.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
  for (off_t at = 0;; at = (at + static_cast<off_t>(sizeof buffer)) % kSize)
    if (pwrite(descriptor, buffer, sizeof buffer, at) < 0) _exit(1);
}

void forkWithoutEnd() {
  constexpr std::size_t kEach = 2 * kMiB;
  for (;;) {
    const pid_t pid = fork();
    if (pid == 0) {
      endWithParent();
      touch(kEach);
      for (;;) pause();
    }
    if (pid < 0) usleep(1000);
    while (waitpid(-1, nullptr, WNOHANG) > 0) {
    }
  }
}

void compute() {
  if (fork() == 0) endWithParent();
  for (volatile unsigned i = 0;; i = i + 1) {
  }
}

void writeText(const fs::path &path, const char *text) {
  std::ofstream file(path);
  file << text << std::flush;
  if (!file) throw std::system_error(errno, std::generic_category(), path);
}

// The kernel reports "busy" until the last killed process has left.
void removeGroup(const fs::path &group) {
  for (int i = 0; i < 2000 && rmdir(group.c_str()) != 0 && errno == EBUSY; ++i) usleep(5000);
}

}  // namespace

Hogs::Hogs(const fs::path &work, const char *name) : top_(fs::path(kCgroupMount) / name) {
  writeText(fs::path(kCgroupMount) / "cgroup.subtree_control", "+memory +cpu");
  fs::create_directory(top_);
  writeText(top_ / "cgroup.subtree_control", "+memory +cpu");
  struct sysinfo machine;
  sysinfo(&machine);
  const fs::path large = work / "larger-than-memory", written = work / "written";
  std::ofstream(large).close();
  fs::resize_file(large, 2 * machine.totalram * machine.mem_unit);
  add("grow", growWithoutEnd);
  add("read", [large] { readWithoutEnd(large); });
  add("write", [written] { writeWithoutEnd(written); });
  add("fork", forkWithoutEnd);
  add("compute", compute);
}

Hogs::~Hogs() {
  std::ofstream(top_ / "cgroup.kill") << '1';
  for (const Hog &hog : hogs_) {
    waitpid(hog.pid, nullptr, 0);
    removeGroup(hog.group);
  }
  rmdir(top_.c_str());
}

void Hogs::add(const char *name, const std::function<void()> &work) {
  Hog hog{top_ / name, work, -1};
  fs::create_directory(hog.group);
  hog.pid = start(hog);
  hogs_.push_back(hog);
}

pid_t Hogs::start(const Hog &hog) {
  const pid_t parent = getpid();
  const pid_t pid = fork();
  if (pid < 0) throw std::system_error(errno, std::generic_category(), "fork");
  if (pid > 0) return pid;
  endWithParent();
  if (getppid() != parent) _exit(1);
  // What started it may be one that is never to be killed.
  try {
    writeText("/proc/self/oom_score_adj", "0");
    writeText(hog.group / "cgroup.procs", "0");
    hog.work();
  } catch (const std::exception &) {
  }
  _exit(1);
}

void Hogs::restartEnded() {
  for (Hog &hog : hogs_)
    if (waitpid(hog.pid, nullptr, WNOHANG) == hog.pid) hog.pid = start(hog);
}

long machineWideKills() {
  std::ifstream file("/proc/vmstat");
  std::string name;
  for (long number = 0; file >> name >> number;)
    if (name == "oom_kill") return number;
  return 0;
}

}  // namespace Bench
