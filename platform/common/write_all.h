// SPDX-License-Identifier: Apache-2.0
// Writes whole texts into files that may take them in parts.
#pragma once

#include <string_view>

namespace Platform {

// Writes all bytes, in as many calls of write as that needs. Returns 0, or the errno of the call
// that failed; then a part of the bytes may have been written.
int writeAll(int fd, std::string_view bytes) noexcept;

}  // namespace Platform
