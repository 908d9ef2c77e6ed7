// Opens the Linux kernel of this machine.
#include "knob/linux/linux_kernel.h"

#include "knob/linux/hierarchy.h"
#include "knob/linux/kernel_on_groups.h"

namespace Knob {

std::unique_ptr<Kernel> openLinuxKernel(const Configuration &configuration) {
  return std::make_unique<Linux::KernelOnGroups>(Linux::openHierarchy(configuration),
                                                 configuration.maxVms);
}

}  // namespace Knob
