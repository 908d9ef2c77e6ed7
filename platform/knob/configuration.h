// SPDX-License-Identifier: Apache-2.0
// libknob's own configuration: which kernel answers, and where it lives.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace Knob {

struct Configuration {
  enum class KernelKind { kEmulated, kLinux };

  KernelKind kernel = KernelKind::kEmulated;
  std::optional<std::string> statePath;  // of the emulated kernel; absent: its default place
  std::string cgroupRoot;                // of the Linux kernel; empty: the mount itself
  uint32_t maxVms = 1024;
  std::string source;  // the file that was read; empty: there is none, and all is default
};

// When a kernel that is opened finds out whether it can be used: at once, or with the first call
// that needs more than what its boot fixed. The latter saves a program that only asks for facts
// most of its start.
enum class Opening { kAtOnce, kWhenNeeded };

// Reads the file that KNOB_CONF names, or /etc/knob.conf. That the latter is missing means
// defaults; a file that was asked for by name must be there. Throws Platform::ConfigError.
Configuration readConfiguration();

// Reads that file; nothing when it does not exist. Throws Platform::ConfigError.
std::optional<Configuration> readConfigurationFile(const std::string &fileName);

}  // namespace Knob
