// SPDX-License-Identifier: Apache-2.0
// The failure of one scheduler-group operation, and the kernel statuses that callers tell apart.
#pragma once

#include <cstdint>
#include <stdexcept>
#include <string>

namespace Sched {

constexpr uint32_t kStatusNotFound = 0x0BAD0003;
constexpr uint32_t kStatusBusy = 0x0BAD0004;
constexpr uint32_t kStatusMemoryBusy = 0x0BAD0080;
constexpr uint32_t kStatusExists = 0x0BAD0005;
constexpr uint32_t kStatusNoMemory = 0x0BAD0014;

// what(): the leading text, ": ", and the kernel's text for the status.
class Exception : public std::runtime_error {
 public:
  Exception(const std::string &leadingText, uint32_t kernelStatus);

  uint32_t status;
};

}  // namespace Sched
