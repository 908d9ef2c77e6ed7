// SPDX-License-Identifier: Apache-2.0
// One open and as many reads as the file needs: files of /proc report no size.
#include "common/read_file.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <array>
#include <cerrno>
#include <system_error>

#include "common/unique_fd.h"

namespace Platform {

namespace {

std::string readAll(const UniqueFd &fd, const std::string &path, size_t maxBytes) {
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

UniqueFd opened(const std::string &path, int flags) {
  UniqueFd fd(::open(path.c_str(), O_RDONLY | O_CLOEXEC | flags));
  if (!fd) throw std::system_error(errno, std::generic_category(), path);
  return fd;
}

class NotRegular final : public std::error_category {
 public:
  const char *name() const noexcept override { return "file type"; }
  std::string message(int) const override { return "not a regular file"; }
};

}  // namespace

std::string readFile(const std::string &path, size_t maxBytes) {
  return readAll(opened(path, 0), path, maxBytes);
}

std::string readRegularFile(const std::string &path, size_t maxBytes) {
  // Without O_NONBLOCK the open of a FIFO waits for a writer.
  const UniqueFd fd = opened(path, O_NONBLOCK);
  struct stat status {};
  if (::fstat(fd.get(), &status) != 0) {
    throw std::system_error(errno, std::generic_category(), path);
  }
  if (!S_ISREG(status.st_mode)) {
    static const NotRegular kNotRegular;
    throw std::system_error(1, kNotRegular, path);
  }
  return readAll(fd, path, maxBytes);
}

}  // namespace Platform
