// SPDX-License-Identifier: Apache-2.0
// The emulated kernel as the rest of libknob and knobctl see it: a kernel whose groups are rows of
// one SQLite file. It reserves nothing; it keeps the same books as a kernel that does.
#pragma once

#include <memory>
#include <optional>
#include <string>

#include "knob/configuration.h"
#include "knob/kernel.h"

namespace Knob {

// Opens the state, and boots it with this machine's facts when there is none yet. Throws
// KernelError: kernel not usable.
std::unique_ptr<Kernel> openEmulatedKernel(const Configuration &configuration,
                                           Opening opening = Opening::kAtOnce);

// The facts to boot with; what is absent is this machine's own, and max-vms the configuration's.
struct BootFacts {
  std::optional<uint32_t> cpus;
  std::optional<uint64_t> memoryMB;
  std::optional<uint32_t> maxVms;
  std::optional<bool> isVm;
  std::optional<std::string> commandLine;
};

// Starts the emulated kernel anew: no groups but the two fixed ones, no members, no peaks. Without
// force a kernel that has other groups is left alone: busy. With force even a state that cannot be
// read is replaced. Throws KernelError: busy, bad parameter (no CPU, no memory, or a command line
// longer than 4095 bytes), kernel not usable.
void bootEmulatedKernel(const Configuration &configuration, const BootFacts &facts, bool force);

// Where the configured emulated kernel keeps its state; the default folder is made when it is
// missing. Throws KernelError: kernel not usable, when that
// folder is not safe to use.
std::string emulatedStatePath(const Configuration &configuration);

}  // namespace Knob
