// SPDX-License-Identifier: Apache-2.0
// Chooses the kernel. There is no falling back from one to the other: a reservation that is not
// real must never look like one.
#include "knob/session.h"

#include "common/key_value_file.h"
#include "knob/emulated/emulated_kernel.h"
#include "knob/linux/linux_kernel.h"

namespace Knob {

Configuration sessionConfiguration() {
  try {
    return readConfiguration();
  } catch (const Platform::ConfigError &error) {
    throw KernelError(Status::kKernelNotUsable, error.what());
  }
}

std::unique_ptr<Kernel> openKernel(const Configuration &configuration, Opening opening) {
  if (configuration.kernel == Configuration::KernelKind::kLinux) {
    return openLinuxKernel(configuration);
  }
  return openEmulatedKernel(configuration, opening);
}

std::unique_ptr<Kernel> openConfiguredKernel(Opening opening) {
  return openKernel(sessionConfiguration(), opening);
}

}  // namespace Knob
