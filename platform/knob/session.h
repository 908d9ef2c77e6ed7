// SPDX-License-Identifier: Apache-2.0
// The way from the configuration to the kernel that it names. libknob's calls and knobctl both come
// through here.
#pragma once

#include <memory>

#include "knob/configuration.h"
#include "knob/kernel.h"

namespace Knob {

// Opens the kernel that the machine's configuration names; an emulated one that has no state yet is
// started with this machine's facts. Throws KernelError: kernel not usable, whose what() is the
// reason, with file and line where the configuration is to blame.
std::unique_ptr<Kernel> openConfiguredKernel(Opening opening = Opening::kAtOnce);

// The same, for a configuration at hand.
std::unique_ptr<Kernel> openKernel(const Configuration &configuration,
                                   Opening opening = Opening::kAtOnce);

// readConfiguration() with its errors as KernelError (kernel not usable).
Configuration sessionConfiguration();

}  // namespace Knob
