// SPDX-License-Identifier: Apache-2.0
#include "worker.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <stdexcept>
#include <system_error>

#include "control_files.h"

namespace Uml {

Worker::Worker(const std::string &group, const std::function<void()> &work) {
  int ends[2];
  if (pipe2(ends, O_CLOEXEC) != 0) throw std::system_error(errno, std::generic_category(), "pipe2");
  pid_ = fork();
  if (pid_ < 0) throw std::system_error(errno, std::generic_category(), "fork");
  if (pid_ == 0) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    try {
      writeControl(group, "cgroup.procs", "0");
      if (write(ends[1], "j", 1) != 1) _exit(1);
      work();
    } catch (const std::exception &error) {
      dprintf(STDERR_FILENO, "worker: %s\n", error.what());
      _exit(1);
    }
    if (write(ends[1], "d", 1) != 1) _exit(1);
    for (;;) pause();
  }
  close(ends[1]);
  done_ = ends[0];
  char joined = 0;
  if (read(done_, &joined, 1) != 1) throw std::runtime_error("no worker in " + group);
}

Worker::~Worker() {
  end();
  close(done_);
}

bool Worker::waitUntilDone() {
  constexpr int kMinute = 60'000;
  pollfd wait{done_, POLLIN, 0};
  char done = 0;
  return poll(&wait, 1, kMinute) == 1 && read(done_, &done, 1) == 1;
}

bool Worker::alive() {
  if (pid_ > 0 && waitpid(pid_, nullptr, WNOHANG) == pid_) pid_ = -1;
  return pid_ > 0;
}

void Worker::end() {
  if (pid_ <= 0) return;
  kill(pid_, SIGKILL);
  waitpid(pid_, nullptr, 0);
  pid_ = -1;
}

void doNothing() {}

std::function<void()> holdMB(size_t megabytes) {
  return [megabytes] {
    const size_t bytes = megabytes << 20;
    void *memory = mmap(nullptr, bytes, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    if (memory == MAP_FAILED) throw std::system_error(errno, std::generic_category(), "mmap");
    constexpr size_t kPage = 4096;
    for (size_t at = 0; at < bytes; at += kPage) static_cast<volatile char *>(memory)[at] = 1;
  };
}

std::function<void()> readThrough(const std::string &file, int times) {
  return [file, times] {
    const int descriptor = open(file.c_str(), O_RDONLY | O_CLOEXEC);
    if (descriptor < 0) throw std::system_error(errno, std::generic_category(), file);
    static char buffer[1 << 16];
    for (int i = 0; i < times; ++i) {
      off_t at = 0;
      for (ssize_t count = 0; (count = pread(descriptor, buffer, sizeof buffer, at)) > 0;)
        at += count;
    }
    close(descriptor);
  };
}

void beBusy() {
  for (volatile unsigned i = 0;; i = i + 1) {
  }
}

}  // namespace Uml
