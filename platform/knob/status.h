// SPDX-License-Identifier: Apache-2.0
// The public statuses as a type of libknob, and their texts for people, in one table.
#pragma once

#include <array>
#include <cstdint>
#include <string_view>

#include "platform/knob_status.h"

namespace Knob {

enum class Status : uint32_t {
  kSuccess = KNOB_STATUS_SUCCESS,
  kFailure = KNOB_STATUS_FAILURE,
  kNotFound = KNOB_STATUS_NOT_FOUND,
  kBusy = KNOB_STATUS_BUSY,
  kExists = KNOB_STATUS_EXISTS,
  kBadParameter = KNOB_STATUS_BAD_PARAMETER,
  kOutOfMemory = KNOB_STATUS_OUT_OF_MEMORY,
  kBadNode = KNOB_STATUS_BAD_NODE,
  kBufferSize = KNOB_STATUS_BUFFER_SIZE,
  kNotSupported = KNOB_STATUS_NOT_SUPPORTED,
  kPermissionDenied = KNOB_STATUS_PERMISSION_DENIED,
  kMemoryBusy = KNOB_STATUS_MEMORY_BUSY,
  kReservationRefused = KNOB_STATUS_RESERVATION_REFUSED,
  kKernelNotUsable = KNOB_STATUS_KERNEL_NOT_USABLE,
};

// The part behind ": " is the usual reason; where the reason of a failure is known, it replaces it.
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
    StatusText{Status::kKernelNotUsable, "kernel not usable (see `knobctl status`)"},
};

// The text of a status. For a status that is not in the table, a text with its number, valid until
// the calling thread asks for another.
const char *statusText(uint32_t status) noexcept;

// The text without the usual reason: "busy". Valid as long as the text.
std::string_view statusName(uint32_t status) noexcept;

}  // namespace Knob
