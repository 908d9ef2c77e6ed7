// SPDX-License-Identifier: Apache-2.0
// The kernel as a tool uses it: its failures are the tool's, with exit status and words for people.
#pragma once

#include <memory>
#include <string>

#include "knob/kernel.h"
#include "knob/session.h"
#include "shared/tool.h"

namespace Knobctl {

// The tool's failure for a kernel's. what: what was tried, such as "delete host/opt/a".
Tools::Failure failure(const std::string &what, const Knob::KernelError &error);

// Calls OPERATION, and throws the Failure of what the kernel refuses.
template <typename Operation>
auto reporting(const std::string &what, const Operation &operation) {
  try {
    return operation();
  } catch (const Knob::KernelError &error) {
    throw failure(what, error);
  }
}

// The same with the configured kernel: calls OPERATION(Kernel &).
template <typename Operation>
auto onKernel(const std::string &what, const Operation &operation) {
  return reporting(what, [&] {
    const auto kernel = Knob::openConfiguredKernel();
    return operation(*kernel);
  });
}

}  // namespace Knobctl
