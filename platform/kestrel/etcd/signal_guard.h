// SPDX-License-Identifier: Apache-2.0
// Keeps a broken connection from ending the process: the TLS library under libcurl may write to a
// socket that the other side has closed.
#pragma once

#include <csignal>
#include <ctime>

namespace Kestrel::Etcd {

// Holds back SIGPIPE from this thread alone, and takes away one that came meanwhile.
class SignalGuard {
 public:
  SignalGuard() {
    sigemptyset(&pipe_);
    sigaddset(&pipe_, SIGPIPE);
    sigset_t pending;
    sigpending(&pending);
    wasPending_ = sigismember(&pending, SIGPIPE) == 1;
    pthread_sigmask(SIG_BLOCK, &pipe_, &before_);
  }
  ~SignalGuard() {
    const timespec noTime{};
    if (!wasPending_) (void)sigtimedwait(&pipe_, nullptr, &noTime);  // usually there is none
    pthread_sigmask(SIG_SETMASK, &before_, nullptr);
  }
  SignalGuard(const SignalGuard &) = delete;
  SignalGuard &operator=(const SignalGuard &) = delete;

 private:
  sigset_t pipe_{}, before_{};
  bool wasPending_ = false;
};

}  // namespace Kestrel::Etcd
