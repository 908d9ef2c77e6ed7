// SPDX-License-Identifier: Apache-2.0
// What this machine says about itself.
#pragma once

#include "knob/kernel.h"

namespace Knob {

// CPUs online, the processor's hypervisor bit, physical memory and the boot command line. maxVms is
// no fact of the machine but of its configuration, and is left at 0.
HostFacts readMachineFacts();

}  // namespace Knob
