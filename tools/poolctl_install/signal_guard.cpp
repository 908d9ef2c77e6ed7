// SPDX-License-Identifier: Apache-2.0
#include "signal_guard.h"

namespace Install {
namespace {

constexpr int kHeldBack[] = {SIGINT, SIGTERM, SIGHUP};

}  // namespace

// pthread_sigmask and sigpending fail only for invalid arguments.
SignalGuard::SignalGuard() {
  sigset_t set;
  sigemptyset(&set);
  for (const int signal : kHeldBack) sigaddset(&set, signal);
  pthread_sigmask(SIG_BLOCK, &set, &before_);
}

SignalGuard::~SignalGuard() {
  pthread_sigmask(SIG_SETMASK, &before_, nullptr);
}

// A signal that was blocked by the caller of the program never gets through, so it does not count.
void SignalGuard::check() const {
  sigset_t waiting;
  sigpending(&waiting);
  for (const int signal : kHeldBack) {
    if (sigismember(&waiting, signal) == 1 && sigismember(&before_, signal) == 0)
      throw Interrupted();
  }
}

}  // namespace Install
