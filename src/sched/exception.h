// SPDX-License-Identifier: Apache-2.0
// The failure of one scheduler-group operation.
#pragma once

#include <cstdint>
#include <stdexcept>
#include <string>

namespace Sched {

// what(): the leading text, ": ", and the kernel's text for the status.
class Exception : public std::runtime_error {
 public:
  Exception(const std::string &leadingText, uint32_t kernelStatus);

  uint32_t status;
};

}  // namespace Sched
