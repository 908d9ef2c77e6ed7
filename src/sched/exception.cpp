// SPDX-License-Identifier: Apache-2.0
// The text of every failed scheduler-group operation.
#include "sched/exception.h"

#include "platform/knob.h"

namespace Sched {

Exception::Exception(const std::string &leadingText, uint32_t kernelStatus)
    : std::runtime_error(leadingText + ": " + NUC_ReturnStatusToString(kernelStatus)),
      status(kernelStatus) {}

}  // namespace Sched
