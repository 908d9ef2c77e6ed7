// SPDX-License-Identifier: Apache-2.0
#include "console/result.h"

#include <unistd.h>

#include <cstdio>
#include <iostream>
#include <stdexcept>

#include "console/printable.h"

namespace Console {

void flushResults() {
  std::cout.flush();
  if (!std::cout || ferror(stdout) != 0) {
    throw std::runtime_error("cannot write to standard output");
  }
}

std::string resultText(const std::string &text) {
  return isatty(STDOUT_FILENO) == 1 ? printable(text) : text;
}

}  // namespace Console
