// SPDX-License-Identifier: Apache-2.0
// What this build of libknob is known by.
#pragma once

#include "knob/kernel.h"

namespace Knob {

// The date of this build, "Mmm dd yyyy hh:mm:ss"; it lasts as long as the library.
const char *buildDate() noexcept;

// The md5 of the interface header and the build date.
BuildSignature buildSignature();

}  // namespace Knob
