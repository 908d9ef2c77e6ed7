// SPDX-License-Identifier: Apache-2.0
#include "loader/definition_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/xattr.h>

#include <cerrno>
#include <istream>

#include "loader/definition_files.h"
#include "yaml/exception.h"
#include "yaml/node.h"

namespace Loader {
namespace {

// Far more than the 100,000 pools of a run take.
constexpr off_t kMaxBytes = 64 * 1024 * 1024;

}  // namespace

const char *installedMarkAt(const std::string &path) noexcept {
  for (const char *const name : kInstalledMarks) {
    char value = 0;
    const ssize_t size = getxattr(path.c_str(), name, &value, sizeof value);
    if (size == 1 && value == 1) return name;
    if (size >= 0 || errno != ENOTSUP) return nullptr;
  }
  return nullptr;
}

DefinitionFile::DefinitionFile(const std::string &path)
    : content_(open(path.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC), std::ios::in) {
  struct stat status {};
  if (!content_.is_open() || fstat(content_.fd(), &status) != 0) Yaml::throwBadFile(path);
  if (!S_ISREG(status.st_mode) && !S_ISDIR(status.st_mode)) Yaml::throwBadFile(path);
  if (S_ISREG(status.st_mode) && status.st_size > kMaxBytes) {
    throw Exception(YAML::Mark::null_mark(), "file is larger than 64 MB");
  }
}

bool DefinitionFile::hasMark(const char *name) noexcept {
  char value = 0;
  const ssize_t size = fgetxattr(content_.fd(), name, &value, sizeof value);
  if (size >= 0 || errno != ENOTSUP) return size == 1 && value == 1;
  // A system that has the first name may have it for paths alone. The second one is Linux's own.
  return name == kInstalledMarks[0];
}

YAML::Node DefinitionFile::read() {
  std::istream stream(&content_);
  return YAML::Load(stream);
}

}  // namespace Loader
