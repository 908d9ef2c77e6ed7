// SPDX-License-Identifier: Apache-2.0
// Starting the emulated kernel: with this machine's facts at the first use, or with chosen facts.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "knob/configuration.h"

namespace Knob {

// The facts to boot with. An absent one is this machine's own; an absent maxVms is the
// configuration's.
struct BootFacts {
  std::optional<uint32_t> cpus;
  std::optional<uint64_t> memoryMB;
  std::optional<uint32_t> maxVms;
  std::optional<bool> isVm;
  std::optional<std::string> commandLine;
};

// Restarts the configured emulated kernel: only the two fixed groups, no members, no peaks. Without
// force a kernel that has other groups is left as it is: busy. With force a state that cannot be
// read is replaced too. Throws KernelError: busy, bad parameter (no CPU, no memory, or a command
// line longer than 4095 bytes), kernel not usable.
void bootEmulatedKernel(const Configuration &configuration, const BootFacts &facts, bool force);

// Boots a kernel with this machine's facts at a path that has no state, unless another process does
// so first. Throws KernelError (kernel not usable).
void bootOnFirstUse(const std::string &path);

}  // namespace Knob
