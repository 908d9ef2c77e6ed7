// SPDX-License-Identifier: Apache-2.0
// Starting the emulated kernel: the only kernel that a tool can boot.
#pragma once

#include <CLI/App.hpp>
#include <optional>
#include <string>

namespace Knobctl {

// An absent value is this machine's own.
struct BootOptions {
  std::optional<uint32_t> cpus, maxVms;
  std::optional<uint64_t> memoryMB;
  bool vm = false;
  std::string commandLine;
  bool hasCommandLine = false;
  bool force = false;
};

void declareBootOptions(CLI::App &command, BootOptions *options);

// Throws Failure: busy, when the running kernel has groups and force is not given.
void bootKernel(const BootOptions &options);

}  // namespace Knobctl
