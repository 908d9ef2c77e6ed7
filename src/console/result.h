// SPDX-License-Identifier: Apache-2.0
// Result lines on standard output, which scripts read. A result that is lost, on a full disk for
// example, is an error.
#pragma once

#include <string>

namespace Console {

// Writes out what the program has printed so far. Throws std::runtime_error if any of it is lost.
void flushResults();

// TEXT as a result line has it: unchanged for scripts, and with its control characters escaped
// where standard output is a terminal.
std::string resultText(const std::string &text);

}  // namespace Console
