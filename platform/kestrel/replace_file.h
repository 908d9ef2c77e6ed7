// SPDX-License-Identifier: Apache-2.0
// Replaces a file whole.
#pragma once

#include <sys/types.h>

#include <string>
#include <string_view>

namespace Kestrel {

// kDurable: also after a loss of power the file has the old content or the new one.
enum class Durability { kNone, kDurable };

// Writes TEXT beside PATH and renames it: a reader finds the old content or the new one. MODE is
// limited by the umask. Throws std::system_error; the old file is then untouched, and nothing is
// left beside it.
void replaceFile(const std::string &path, std::string_view text, mode_t mode,
                 Durability durability = Durability::kDurable);

// Writes all of TEXT. Throws std::system_error.
void writeAll(int fd, std::string_view text);

}  // namespace Kestrel
