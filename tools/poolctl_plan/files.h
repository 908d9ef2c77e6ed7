// SPDX-License-Identifier: Apache-2.0
// What a command line of poolctl-plan names: definition files, and the machine to read them for.
#pragma once

#include <string>
#include <vector>

#include "plan_check/check.h"

namespace Plan {

struct Input {
  std::vector<std::string> files;  // empty: the definition folder
  std::string factsPath;           // empty: this machine
};

// The files in the order in which they are checked. Throws std::system_error when the definition
// folder cannot be read.
std::vector<std::string> pathsOf(const Input &input);

// The machine and its groups. Throws std::runtime_error for a file of facts that cannot be used.
Surroundings surroundingsOf(const Input &input);

// checkFiles(), and an error for each file of the definition folder that is not installed.
Checked checkInput(const Input &input, const Surroundings &surroundings);

}  // namespace Plan
