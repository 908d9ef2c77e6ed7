// SPDX-License-Identifier: Apache-2.0
// Opens, closes, and keeps the handle from crossing a fork: a kernel's file locks belong to the
// process that took them, while its memory of them would be inherited.
#include "knob/live_kernel.h"

#include <pthread.h>

#include "knob/session.h"

namespace Knob {
namespace {

// Closes in order when the process exits or the library is unloaded.
struct CloseAtExit {
  ~CloseAtExit() { LiveKernel::instance().close(); }
};

}  // namespace

LiveKernel &LiveKernel::instance() {
  static LiveKernel *const kInstance = [] {
    (void)::pthread_atfork(&beforeFork, &afterFork, &afterFork);
    return new LiveKernel;  // never deleted: see the class
  }();
  return *kInstance;
}

void LiveKernel::open() {
  if (kernel_) return;
  kernel_ = openConfiguredKernel(Opening::kWhenNeeded);
  static const CloseAtExit kCloseAtExit;
}

void LiveKernel::close() {
  const std::lock_guard lock(mutex_);
  kernel_.reset();
}

void LiveKernel::beforeFork() {
  instance().mutex_.lock();
  instance().kernel_.reset();
}

void LiveKernel::afterFork() {
  instance().mutex_.unlock();
}

}  // namespace Knob
