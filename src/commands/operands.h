// SPDX-License-Identifier: Apache-2.0
// What getopt has left of a command line.
#pragma once

#include <unistd.h>

#include <string>
#include <vector>

// The arguments behind the options, in their order. Valid once getopt has answered -1.
inline std::vector<std::string> operands(int argc, char **argv) {
  return {argv + optind, argv + argc};
}
