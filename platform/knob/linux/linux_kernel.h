// The Linux kernel as the rest of libknob sees it: groups are cgroup v2 groups of this machine, and
// a reservation is the kernel's own. There is no state but the kernel's.
#pragma once

#include <memory>

#include "knob/configuration.h"
#include "knob/kernel.h"

namespace Knob {

// Throws KernelError: kernel not usable, with the reason and how to mend it. Makes nothing yet.
std::unique_ptr<Kernel> openLinuxKernel(const Configuration &configuration);

}  // namespace Knob
