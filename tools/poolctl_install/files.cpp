// SPDX-License-Identifier: Apache-2.0
#include "files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <stdexcept>
#include <system_error>

#include "shared/tool.h"

namespace Install {

void throwSystemError(const std::string &path) {
  throw std::system_error(errno, std::generic_category(), path);
}

void throwOpenError(const std::string &path) {
  if (errno != ENOENT) throwSystemError(path);
  throw Tools::Failure(Tools::kExitNotFound, path + ": " + std::generic_category().message(ENOENT));
}

Platform::UniqueFd openRegularFile(const std::string &path) {
  Platform::UniqueFd file(open(path.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
  if (!file) throwOpenError(path);
  struct stat info {};
  if (fstat(file.get(), &info) != 0) throwSystemError(path);
  if (!S_ISREG(info.st_mode)) throw std::runtime_error(path + ": not a regular file");
  return file;
}

void writeAll(int fd, const char *text, size_t size, const std::string &path) {
  while (size > 0) {
    const ssize_t written = write(fd, text, size);
    if (written < 0) {
      if (errno == EINTR) continue;
      throwSystemError(path);
    }
    text += written;
    size -= static_cast<size_t>(written);
  }
}

void copyContent(int from, const std::string &fromPath, int to, const std::string &toPath) {
  char buffer[65536];
  for (size_t total = 0;;) {
    const ssize_t size = read(from, buffer, sizeof buffer);
    if (size == 0) return;
    if (size < 0) {
      if (errno == EINTR) continue;
      throwSystemError(fromPath);
    }
    total += static_cast<size_t>(size);
    if (total > kMaxFileSize) {
      throw std::runtime_error(fromPath + ": larger than " + std::to_string(kMaxFileSize >> 20U) +
                               " MB, the most that a definition file may have");
    }
    writeAll(to, buffer, static_cast<size_t>(size), toPath);
  }
}

}  // namespace Install
