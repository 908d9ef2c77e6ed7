// SPDX-License-Identifier: Apache-2.0
// The boot that needs nobody to ask for it.
#pragma once

#include <string>

namespace Knob {

// Boots a kernel with this machine's facts at a path that has no state, unless another process does
// so first. Throws KernelError (kernel not usable).
void bootOnFirstUse(const std::string &path);

}  // namespace Knob
