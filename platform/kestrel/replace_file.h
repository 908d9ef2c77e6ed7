// SPDX-License-Identifier: Apache-2.0
// Replaces a file whole.
#pragma once

#include <sys/types.h>

#include <string>
#include <string_view>

namespace Kestrel {

// Writes TEXT beside PATH and renames it: a reader, and a loss of power, find the old content or
// the new one. MODE is limited by the umask. Throws std::system_error; the old file is then
// untouched, and nothing is left beside it.
void replaceFile(const std::string &path, std::string_view text, mode_t mode);

// Writes all of TEXT. Throws std::system_error.
void writeAll(int fd, std::string_view text);

}  // namespace Kestrel
