// SPDX-License-Identifier: Apache-2.0
#include "common/write_all.h"

#include <unistd.h>

#include <cerrno>

namespace Platform {

int writeAll(int fd, std::string_view bytes) noexcept {
  while (!bytes.empty()) {
    const ssize_t count = ::write(fd, bytes.data(), bytes.size());
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return errno;
    if (count == 0) return EIO;  // would be tried for ever
    bytes.remove_prefix(static_cast<size_t>(count));
  }
  return 0;
}

}  // namespace Platform
