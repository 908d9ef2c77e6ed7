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

// Ends with the test, however that ends.
[[noreturn]] void holdMemory(size_t memoryMB, int ready) {
  ::prctl(PR_SET_PDEATHSIG, SIGKILL);
  const size_t size = memoryMB << 20;
  volatile char *memory = static_cast<char *>(std::malloc(size + 1));
  if (memory == nullptr) ::_exit(1);
  for (size_t at = 0; at < size; at += 4096) memory[at] = 1;
  const char byte = 0;
  if (::write(ready, &byte, 1) != 1) ::_exit(1);
  for (;;) ::pause();
}

}  // namespace

HeldProcess::HeldProcess(size_t memoryMB) {
  int ready[2];
  if (::pipe(ready) != 0) fail("pipe");
  pid_ = ::fork();
  if (pid_ < 0) fail("fork");
  if (pid_ == 0) holdMemory(memoryMB, ready[1]);
  ::close(ready[1]);
  char byte = 0;
  const ssize_t got = ::read(ready[0], &byte, 1);
  ::close(ready[0]);
  if (got != 1) fail("start of a process");
}

HeldProcess::~HeldProcess() {
  end();
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
