// SPDX-License-Identifier: Apache-2.0
// The file in which a stand-in library records its calls, one on each line.
#pragma once

#include <string>

namespace Recording {

// Appends LINE to the file that the environment variable VARIABLE names; does nothing without it.
void record(const char *variable, const std::string &line);

// FORMAT with its arguments inserted, as by printf.
std::string formatted(const char *format, ...) __attribute__((format(printf, 1, 2)));

// TEXT between double quotes, with line ends and quotes written as escapes.
std::string quoted(const std::string &text);

}  // namespace Recording
