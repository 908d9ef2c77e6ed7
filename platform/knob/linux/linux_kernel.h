// SPDX-License-Identifier: Apache-2.0
// The Linux kernel as the rest of libknob sees it: groups are cgroup v2 groups of this machine, and
// a reservation is the kernel's own. There is no state but the kernel's.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "knob/configuration.h"
#include "knob/kernel.h"

namespace Knob {

// Throws KernelError: kernel not usable, with the reason and how to mend it. Makes nothing yet.
std::unique_ptr<Kernel> openLinuxKernel(const Configuration &configuration);

// Where the groups of this host stand, for people.
struct LinuxHost {
  std::string path;                   // of the folder that holds, or will hold, host
  bool hasGroups = false;             // whether host is there yet
  std::vector<std::string> problems;  // what is missing, and how to mend it
};

// Looks and makes nothing. Throws KernelError: kernel not usable, with the reason.
LinuxHost lookAtLinuxHost(const Configuration &configuration);

}  // namespace Knob
