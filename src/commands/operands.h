// SPDX-License-Identifier: Apache-2.0
// The operands of a command line.
#pragma once

#include <unistd.h>

#include <string>
#include <vector>

// The arguments from getopt's optind on, in their order.
inline std::vector<std::string> operands(int argc, char **argv) {
  return {argv + optind, argv + argc};
}
