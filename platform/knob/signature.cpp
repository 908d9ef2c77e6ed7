// SPDX-License-Identifier: Apache-2.0
// The one file that holds the build's date; SOURCE_DATE_EPOCH fixes it for builds that must be
// alike.
#include "knob/signature.h"

#include "interface_md5.h"

namespace Knob {

const char *buildDate() noexcept {
  return __DATE__ " " __TIME__;
}

BuildSignature buildSignature() {
  return {kInterfaceMd5, buildDate()};
}

}  // namespace Knob
