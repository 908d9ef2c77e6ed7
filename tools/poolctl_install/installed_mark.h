// SPDX-License-Identifier: Apache-2.0
// The mark by which a definition file counts as installed.
#pragma once

#include <optional>
#include <string>

namespace Install {

// The mark's value, or none. One byte of value 1 counts as installed.
using Mark = std::optional<std::string>;

extern const Mark kInstalled;

Mark readMark(int file);

// Gives an open file that mark, under the first of its names that the file system supports, or
// removes it. path: for the message. Throws std::runtime_error; the mark is then unchanged.
void writeMark(int file, const Mark &mark, const std::string &path);

}  // namespace Install
