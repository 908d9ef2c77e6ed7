// SPDX-License-Identifier: Apache-2.0
// libknob's own configuration: which kernel answers, and where it lives.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace Knob {

// What the Linux kernel keeps for the system itself and never promises to groups. Absent: its
// default.
struct Reserve {
  std::optional<int64_t> memoryMB;    // 5 percent of memory, at least 64
  std::optional<int64_t> cpuPercent;  // of one CPU: 5 percent of all CPUs
};

struct Configuration {
  enum class KernelKind { kEmulated, kLinux };

  KernelKind kernel = KernelKind::kEmulated;
  std::optional<std::string> statePath;  // of the emulated kernel; absent: its default place
  std::string cgroupRoot;                // of the Linux kernel; empty: the mount itself
  uint32_t maxVms = 1024;
  Reserve reserve;     // of the Linux kernel
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
