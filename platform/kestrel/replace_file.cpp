// SPDX-License-Identifier: Apache-2.0
// The scratch file beside the file has a name of its own for each process and each call.
#include "kestrel/replace_file.h"

#include <fcntl.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <system_error>

#include "common/unique_fd.h"

namespace Kestrel {

namespace {

[[noreturn]] void fail(int error, const std::string &path) {
  throw std::system_error(error, std::generic_category(), path);
}

}  // namespace

void writeAll(int fd, std::string_view text) {
  while (!text.empty()) {
    const ssize_t count = ::write(fd, text.data(), text.size());
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) fail(errno, "write");
    text.remove_prefix(static_cast<size_t>(count));
  }
}

void replaceFile(const std::string &path, std::string_view text, mode_t mode,
                 Durability durability) {
  static std::atomic<unsigned> calls{0};
  const std::string scratch =
      path + ".new-" + std::to_string(getpid()) + "-" + std::to_string(++calls);
  (void)unlink(scratch.c_str());  // left by a process of the same number that was killed
  const Platform::UniqueFd fd(
      open(scratch.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, mode));
  if (!fd) fail(errno, path);
  try {
    writeAll(fd.get(), text);
    if (durability == Durability::kDurable && fsync(fd.get()) != 0) fail(errno, path);
    if (rename(scratch.c_str(), path.c_str()) != 0) fail(errno, path);
  } catch (...) {
    (void)unlink(scratch.c_str());
    throw;
  }
}

}  // namespace Kestrel
