// SPDX-License-Identifier: Apache-2.0
// How poolctl-install opens and copies files, and the errors that name them.
#pragma once

#include <cstddef>
#include <string>

#include "common/unique_fd.h"

namespace Install {

// In bytes. A definition file of this size declares far more pools than a host can have.
constexpr size_t kMaxFileSize = size_t{64} << 20U;

// Throws std::system_error with errno and the path.
[[noreturn]] void throwSystemError(const std::string &path);
// For a file that the command line names: throws Tools::Failure when it does not exist.
[[noreturn]] void throwOpenError(const std::string &path);

// Opens a regular file for reading. Never waits, as the open of a FIFO would. Throws
// std::system_error, Tools::Failure when the file does not exist, or std::runtime_error when it is
// not a regular file.
Platform::UniqueFd openRegularFile(const std::string &path);

// Writes all of TEXT, at the descriptor's position. Throws std::system_error, naming PATH.
void writeAll(int fd, const char *text, size_t size, const std::string &path);

// Copies what is left to read, at most kMaxFileSize bytes. The paths are for messages. Throws
// std::system_error, or std::runtime_error when there is more to read.
void copyContent(int from, const std::string &fromPath, int to, const std::string &toPath);

}  // namespace Install
