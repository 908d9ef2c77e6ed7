// SPDX-License-Identifier: Apache-2.0
// Runs a program to its end and measures its time and memory.
#pragma once

#include <string>
#include <vector>

namespace Bench {

struct Cost {
  double wallMicroseconds = 0;
  double cpuMicroseconds = 0;
  double peakKB = 0;
};

// Its output goes to /dev/null, its errors to ours. Throws std::runtime_error when the program
// cannot be started or does not end with status 0.
Cost runProgram(const std::vector<std::string> &commandLine);

}  // namespace Bench
