// SPDX-License-Identifier: Apache-2.0
// The process says by a byte that it is ready, and then waits for the case to kill it.
#include "held_process.h"

#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <system_error>

namespace Contract {
namespace {

[[noreturn]] void fail(const char *what) {
  throw std::system_error(errno, std::generic_category(), what);
}

// Ends with the test, however that ends. An order is an amount in MB; the answer is one byte.
[[noreturn]] void holdWhatIsOrdered(int orders, int answers) {
  ::prctl(PR_SET_PDEATHSIG, SIGKILL);
  constexpr size_t kPageBytes = 4096;
  const char done = 0;
  size_t memoryMB = 0;
  while (::write(answers, &done, 1) == 1 &&
         ::read(orders, &memoryMB, sizeof(memoryMB)) == static_cast<ssize_t>(sizeof(memoryMB))) {
    const size_t size = memoryMB << 20;
    volatile char *memory = static_cast<char *>(std::malloc(size + 1));
    if (memory == nullptr) break;
    for (size_t at = 0; at < size; at += kPageBytes) memory[at] = 1;
  }
  ::_exit(1);
}

void awaitAnswer(int answers) {
  char byte = 0;
  if (::read(answers, &byte, 1) != 1) fail("a process does not answer");
}

}  // namespace

HeldProcess::HeldProcess() {
  int orders[2], answers[2];
  if (::pipe(orders) != 0 || ::pipe(answers) != 0) fail("pipe");
  pid_ = ::fork();
  if (pid_ < 0) fail("fork");
  if (pid_ == 0) {
    // Without the other ends, the death of either process is seen by the other.
    ::close(orders[1]);
    ::close(answers[0]);
    holdWhatIsOrdered(orders[0], answers[1]);
  }
  ::close(orders[0]);
  ::close(answers[1]);
  orders_ = orders[1];
  answers_ = answers[0];
  awaitAnswer(answers_);
}

HeldProcess::~HeldProcess() {
  end();
  ::close(orders_);
  ::close(answers_);
}

void HeldProcess::hold(size_t memoryMB) {
  if (::write(orders_, &memoryMB, sizeof(memoryMB)) != static_cast<ssize_t>(sizeof(memoryMB))) {
    fail("a process takes no orders");
  }
  awaitAnswer(answers_);
}

void HeldProcess::endButDoNotReap() {
  ::kill(pid_, SIGKILL);
  siginfo_t info{};
  (void)::waitid(P_PID, static_cast<id_t>(pid_), &info, WEXITED | WNOWAIT);
}

void HeldProcess::end() {
  if (pid_ < 0) return;
  ::kill(pid_, SIGKILL);
  (void)::waitpid(pid_, nullptr, 0);
  pid_ = -1;
}

}  // namespace Contract
