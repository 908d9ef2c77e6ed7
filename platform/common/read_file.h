// SPDX-License-Identifier: Apache-2.0
// Reads whole small files: configurations and the kernel's text files.
#pragma once

#include <cstddef>
#include <string>

namespace Platform {

// The content of a file of at most maxBytes. Throws std::system_error with the errno and the
// path; a larger file is EFBIG.
std::string readFile(const std::string &path, size_t maxBytes);

// The same for a path that comes from a user or the environment: refuses what is not a regular
// file, and never waits for the writer of a FIFO.
std::string readRegularFile(const std::string &path, size_t maxBytes);

}  // namespace Platform
