// SPDX-License-Identifier: Apache-2.0
// The machine that definitions are evaluated for: this one, or one whose facts are in a file.
#pragma once

#include <cstdint>
#include <string>

#include "calc/variable_table.h"
#include "knob/kernel.h"

namespace Plan {

struct Machine {
  bool isKnown = false;  // false: the facts are placeholders
  Calc::VariableTable facts;
  int64_t memoryMB = 0;    // that pools can reserve in all
  int64_t cpuPercent = 0;  // likewise, in percent of one CPU
};

// The machine of the running kernel, which has promised no more than it can give. Throws
// Loader::Exception when poolctl could not read the facts either.
Machine thisMachine(Knob::Kernel &kernel);

// For checks that need names only.
Machine unknownMachine();

// The facts as a file that readMachine() reads.
std::string machineText(const Machine &machine);

// Throws std::runtime_error, which names the file: cannot be read, not a mapping, an unknown or
// missing fact, a value that is not a number.
Machine readMachine(const std::string &path);

}  // namespace Plan
