// SPDX-License-Identifier: Apache-2.0
// Writes the mark that the loader reads, under the loader's own names and in its order.
#include "installed_mark.h"

#include <sys/statfs.h>
#include <sys/xattr.h>

#include <cerrno>
#include <cstdio>
#include <stdexcept>
#include <system_error>

#include "loader/definition_files.h"

namespace Install {
namespace {

constexpr size_t kMaxMarkSize = 65536;  // Linux's limit for any attribute

// The magic number is the only name that every file system has.
std::string fileSystemOf(int file) {
  struct statfs info {};
  if (fstatfs(file, &info) != 0) return "unknown";
  char text[32];
  std::snprintf(text, sizeof text, "type 0x%lx", static_cast<unsigned long>(info.f_type));
  return text;
}

std::runtime_error markError(int file, const std::string &path, int error) {
  if (error == ENOTSUP) {
    return std::runtime_error(path + ": the file system (" + fileSystemOf(file) +
                              ") cannot hold the installed mark: it has no extended attributes "
                              "for users");
  }
  return std::runtime_error(
      path + ": the installed mark cannot be changed: " + std::generic_category().message(error));
}

}  // namespace

const Mark kInstalled = std::string(1, '\1');

Mark readMark(int file) {
  for (const char *const name : Loader::kInstalledMarks) {
    std::string value(kMaxMarkSize, '\0');
    const ssize_t size = fgetxattr(file, name, value.data(), value.size());
    if (size >= 0) return value.substr(0, static_cast<size_t>(size));
    if (errno != ENOTSUP) break;
  }
  return std::nullopt;
}

void writeMark(int file, const Mark &mark, const std::string &path) {
  for (const char *const name : Loader::kInstalledMarks) {
    const int result =
        mark ? fsetxattr(file, name, mark->data(), mark->size(), 0) : fremovexattr(file, name);
    if (result == 0 || (!mark && errno == ENODATA)) return;
    if (errno != ENOTSUP) break;
  }
  throw markError(file, path, errno);
}

}  // namespace Install
