// SPDX-License-Identifier: Apache-2.0
// What `knobctl status` prints: which kernel is configured, where it is, and whether it can be
// used.
#pragma once

#include <string>
#include <utility>
#include <vector>

namespace Knobctl {

struct KernelReport {
  std::vector<std::pair<std::string, std::string>> lines;  // label and text
  std::string problem;  // why the kernel cannot be used; empty when it can
};

// Throws nothing for a configuration or a kernel that is not usable: that is the problem of the
// report. Does not boot an emulated kernel that has no state yet.
KernelReport reportOnKernel();

}  // namespace Knobctl
