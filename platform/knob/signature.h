// SPDX-License-Identifier: Apache-2.0
// What this build of libknob is known by, and when a kernel of another build works with it.
#pragma once

#include "knob/kernel.h"

namespace Knob {

// The date of this build, "Mmm dd yyyy hh:mm:ss"; it lasts as long as the library.
const char *buildDate() noexcept;

// The md5 of the interface and the build date.
BuildSignature buildSignature();

// Whether libraries with these signatures work on the same kernel. The build date does not count: a
// rebuilt library with the same interface works on groups that were made before.
inline bool sameInterface(const BuildSignature &left, const BuildSignature &right) {
  return left.md5 == right.md5;
}

}  // namespace Knob
