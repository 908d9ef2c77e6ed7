// SPDX-License-Identifier: Apache-2.0
// The one kernel handle of a process, opened at the first call that needs it and shared by its
// threads, one call at a time.
#pragma once

#include <memory>
#include <mutex>

#include "knob/kernel.h"

namespace Knob {

class LiveKernel {
 public:
  // Lives until the process ends, so that calls from exit handlers still find it.
  static LiveKernel &instance();

  // Calls f(Kernel &). Throws what it throws, and KernelError (kernel not usable).
  template <typename F>
  auto with(const F &f) {
    const std::lock_guard lock(mutex_);
    open();
    try {
      return f(*kernel_);
    } catch (const KernelError &error) {
      // The next call opens it again: the state may have been repaired by then.
      if (error.status == Status::kKernelNotUsable) kernel_.reset();
      throw;
    }
  }

  // Gives the handle back; the next call opens it again.
  void close();

 private:
  LiveKernel() = default;
  void open();
  static void beforeFork();
  static void afterFork();

  std::mutex mutex_;
  std::unique_ptr<Kernel> kernel_;
};

}  // namespace Knob
