// SPDX-License-Identifier: Apache-2.0
// One open, as many reads as the file needs: files of /proc have no size to ask for.
#include "common/read_file.h"

#include <fcntl.h>

#include <array>
#include <cerrno>
#include <system_error>

#include "common/unique_fd.h"

namespace Platform {

std::string readFile(const std::string &path, size_t maxBytes) {
  const UniqueFd fd(::open(path.c_str(), O_RDONLY | O_CLOEXEC));
  if (!fd) throw std::system_error(errno, std::generic_category(), path);

  std::string content;
  std::array<char, 4096> block{};
  for (;;) {
    const ssize_t count = ::read(fd.get(), block.data(), block.size());
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) throw std::system_error(errno, std::generic_category(), path);
    if (count == 0) return content;
    content.append(block.data(), static_cast<size_t>(count));
    if (content.size() > maxBytes) {
      throw std::system_error(EFBIG, std::generic_category(), path);
    }
  }
}

}  // namespace Platform
