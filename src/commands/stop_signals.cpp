// SPDX-License-Identifier: Apache-2.0
// The signals are blocked and polled, not handled: a handler would interrupt the system calls
// within a pool.
#include "commands/stop_signals.h"

#include <pthread.h>
#include <signal.h>
#include <unistd.h>

#include "console/message.h"

namespace Commands {
namespace {

struct StopSignal {
  int number;
  const char *name;
};

constexpr StopSignal kStopSignals[] = {
    {SIGINT, "SIGINT"}, {SIGTERM, "SIGTERM"}, {SIGHUP, "SIGHUP"}};

bool isIgnored(int signal) {
  struct sigaction current;
  return sigaction(signal, nullptr, &current) == 0 && current.sa_handler == SIG_IGN;
}

}  // namespace

void ignoreBrokenPipes() noexcept {
  signal(SIGPIPE, SIG_IGN);
}

StopSignals::StopSignals() noexcept {
  sigset_t blocked;
  sigemptyset(&blocked);
  pthread_sigmask(SIG_BLOCK, nullptr, &blocked);
  sigemptyset(&watched_);
  for (const StopSignal &stop : kStopSignals) {
    if (!isIgnored(stop.number) && sigismember(&blocked, stop.number) == 0) {
      sigaddset(&watched_, stop.number);
    }
  }
  pthread_sigmask(SIG_BLOCK, &watched_, nullptr);
}

bool StopSignals::poll() noexcept {
  constexpr timespec kNow{};
  bool arrived = false;
  for (int signal; (signal = sigtimedwait(&watched_, nullptr, &kNow)) > 0;) {
    arrived = true;
    take(signal);
  }
  return arrived;
}

void StopSignals::take(int signal) noexcept {
  if (first_ != 0) return;
  first_ = signal;
  for (const StopSignal &stop : kStopSignals) {
    if (stop.number == signal) Console::printError("stopped by ", stop.name);
  }
}

void StopSignals::endProcess() noexcept {
  // No handler was installed for it, so its default action ends the process.
  raise(first_);
  pthread_sigmask(SIG_UNBLOCK, &watched_, nullptr);
  _exit(128 + first_);
}

}  // namespace Commands
