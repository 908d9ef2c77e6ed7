// SPDX-License-Identifier: Apache-2.0
// The Linux kernel as the rest of libknob sees it: groups are cgroup v2 groups of this machine, and
// Linux itself enforces a reservation. All state is in cgroups.
#pragma once

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "knob/configuration.h"
#include "knob/kernel.h"

namespace Knob {

// Throws KernelError: kernel not usable, with the reason and what to do. Makes no groups yet.
std::unique_ptr<Kernel> openLinuxKernel(const Configuration &configuration);

// Where this machine's groups are, for people.
struct LinuxHost {
  std::string path;                   // of the folder that contains, or will contain, host
  bool hasGroups = false;             // whether host exists
  std::vector<std::string> problems;  // each with what to do
  // Lines for the status. Of memory and of the CPUs: "memory", "480 MB: 64 MB for the system; 416
  // MB for groups, which reserve 300 MB".
  std::vector<std::pair<std::string, std::string>> account;
};

// Only looks. Throws KernelError: kernel not usable, with the reason.
LinuxHost lookAtLinuxHost(const Configuration &configuration);

}  // namespace Knob
