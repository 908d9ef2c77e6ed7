// SPDX-License-Identifier: Apache-2.0
// Lets a signal end the program only where it leaves nothing half done.
#pragma once

#include <csignal>
#include <exception>

namespace Install {

// Thrown when a signal is waiting. Nothing catches it but main(): destructors undo what is undone,
// and the program ends by the signal as soon as the guard lets it through.
class Interrupted : public std::exception {
 public:
  const char *what() const noexcept override { return "interrupted"; }
};

// Holds back SIGINT, SIGTERM and SIGHUP as long as it lives. It must be the first object of an
// operation, so that everything else has been destroyed when a signal gets through.
class SignalGuard {
 public:
  SignalGuard();
  ~SignalGuard();
  SignalGuard(const SignalGuard &) = delete;
  SignalGuard &operator=(const SignalGuard &) = delete;

  // Throws Interrupted when one of the signals is waiting.
  void check() const;

 private:
  sigset_t before_;
};

}  // namespace Install
