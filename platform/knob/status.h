// SPDX-License-Identifier: Apache-2.0
// The statuses of libknob and their texts for people, in one table.
#pragma once

#include <array>
#include <cstdint>

namespace Knob {

enum class Status : uint32_t {
  kSuccess = 0,
  kFailure = 0x0BAD0001,
  kNotFound = 0x0BAD0003,
  kBusy = 0x0BAD0004,
  kExists = 0x0BAD0005,
  kBadParameter = 0x0BAD0007,
  kOutOfMemory = 0x0BAD0014,
  kBadNode = 0x0BAD0040,
  kBufferSize = 0x0BAD0041,
  kNotSupported = 0x0BAD0042,
  kPermissionDenied = 0x0BAD0043,
  kMemoryBusy = 0x0BAD0080,
  kReservationRefused = 0x0BAD0081,
  kKernelNotUsable = 0x0BAD00C0,
};

struct StatusText {
  Status status;
  const char *text;
};

inline constexpr std::array kStatusTexts = {
    StatusText{Status::kSuccess, "success"},
    StatusText{Status::kFailure, "failure inside the kernel"},
    StatusText{Status::kNotFound, "not found"},
    StatusText{Status::kBusy, "busy: child groups or living processes in it"},
    StatusText{Status::kExists, "already exists"},
    StatusText{Status::kBadParameter, "bad parameter"},
    StatusText{Status::kOutOfMemory, "out of memory"},
    StatusText{Status::kBadNode, "no such node"},
    StatusText{Status::kBufferSize, "output buffer missing or too small"},
    StatusText{Status::kNotSupported, "not supported"},
    StatusText{Status::kPermissionDenied, "permission denied"},
    StatusText{Status::kMemoryBusy, "busy: living processes use more memory than that"},
    StatusText{
        Status::kReservationRefused,
        "reservation refused: more than the group, one above it or the machine has room for"},
    StatusText{Status::kKernelNotUsable, "kernel not usable (`knobctl status` tells why)"},
};

// The text of a status. One that the table does not have gets a text with its number, which lasts
// until the calling thread asks for another.
const char *statusText(uint32_t status) noexcept;

}  // namespace Knob
