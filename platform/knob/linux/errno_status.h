// SPDX-License-Identifier: Apache-2.0
// From what Linux answers to what libknob answers: the one place that knows errno.
#pragma once

#include <string>

#include "knob/kernel.h"

namespace Knob::Linux {

// An errno that nobody foresaw is a failure, never a success.
Status statusOf(int error) noexcept;

// Throws the KernelError of an errno: "WHAT: system's text".
[[noreturn]] void fail(int error, const std::string &what);

// The same with a status that the call alone cannot tell.
[[noreturn]] void fail(Status status, int error, const std::string &what);

[[noreturn]] void noSuchGroup();

}  // namespace Knob::Linux
