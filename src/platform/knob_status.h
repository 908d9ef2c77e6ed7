/* SPDX-License-Identifier: Apache-2.0 */
/* The statuses that libknob's calls return. Programs decide on these numbers, never on the texts of
   NUC_ReturnStatusToString. A status that is not in this list is a failure too. */
#ifndef POOLCTL_PLATFORM_KNOB_STATUS_H
#define POOLCTL_PLATFORM_KNOB_STATUS_H

#ifdef __cplusplus
#include <cstdint>
enum KNOB_Status : std::uint32_t {
#else
enum KNOB_Status {
#endif
  KNOB_STATUS_SUCCESS = 0,
  KNOB_STATUS_FAILURE = 0x0BAD0001, /* inside the kernel; the others name a cause */
  KNOB_STATUS_NOT_FOUND = 0x0BAD0003,
  KNOB_STATUS_BUSY = 0x0BAD0004, /* child groups or living processes are in the group */
  KNOB_STATUS_EXISTS = 0x0BAD0005,
  KNOB_STATUS_BAD_PARAMETER = 0x0BAD0007,
  KNOB_STATUS_OUT_OF_MEMORY = 0x0BAD0014,
  KNOB_STATUS_BAD_NODE = 0x0BAD0040,
  KNOB_STATUS_BUFFER_SIZE = 0x0BAD0041, /* the output buffer is missing or too small */
  KNOB_STATUS_NOT_SUPPORTED = 0x0BAD0042,
  KNOB_STATUS_PERMISSION_DENIED = 0x0BAD0043,
  KNOB_STATUS_MEMORY_BUSY = 0x0BAD0080, /* living processes use more memory than that */
  KNOB_STATUS_RESERVATION_REFUSED = 0x0BAD0081,
  KNOB_STATUS_KERNEL_NOT_USABLE = 0x0BAD00C0
};

#endif
