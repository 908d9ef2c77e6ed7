// SPDX-License-Identifier: Apache-2.0
// What `knobctl status` tells: which kernel, where it lives, and whether it can be used.
#pragma once

#include <string>
#include <utility>
#include <vector>

namespace Knobctl {

struct Condition {
  std::vector<std::pair<std::string, std::string>> lines;  // label and text, as people read them
  std::string problem;  // why the kernel cannot be used; empty when it can
};

// Never throws for what is wrong with the configuration or the kernel. An emulated kernel that has
// not been used yet is left as it is.
Condition lookAtKernel();

}  // namespace Knobctl
