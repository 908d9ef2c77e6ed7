// SPDX-License-Identifier: Apache-2.0
// No descriptor stays open: a run may install more files than a process may have open.
#include "staged_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstdlib>

#include "files.h"
#include "installed_mark.h"
#include "loader/definition_files.h"

namespace Install {
namespace {

constexpr mode_t kFileMode = 0644;
constexpr const char kPrefix[] = ".install.";
constexpr size_t kRandomLetters = 6;  // of mkstemp

}  // namespace

StagedFile::StagedFile(const DefinitionFolder &folder, const std::string &source)
    : folder_(folder) {
  const Platform::UniqueFd from = openRegularFile(source);
  std::string path = DefinitionFolder::pathOf(kPrefix + std::string(kRandomLetters, 'X'));
  const Platform::UniqueFd to(mkostemp(path.data(), O_CLOEXEC));
  if (!to) throwSystemError(Loader::kDefinitionFolder);
  temporary_ = path.substr(path.rfind('/') + 1);
  try {
    copyContent(from.get(), source, to.get(), Loader::kDefinitionFolder);
  } catch (...) {
    (void)unlinkat(folder_.fd(), temporary_.c_str(), 0);
    throw;
  }
}

StagedFile::~StagedFile() {
  if (!temporary_.empty()) (void)unlinkat(folder_.fd(), temporary_.c_str(), 0);
}

void StagedFile::finish() {
  const Platform::UniqueFd file(
      openat(folder_.fd(), temporary_.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
  if (!file) throwSystemError(path());
  writeMark(file.get(), kInstalled, Loader::kDefinitionFolder);
  if (fchmod(file.get(), kFileMode) != 0) throwSystemError(path());
  if (fsync(file.get()) != 0) throwSystemError(path());
}

void StagedFile::placeAs(const std::string &name) {
  if (renameat(folder_.fd(), temporary_.c_str(), folder_.fd(), name.c_str()) != 0)
    throwSystemError(DefinitionFolder::pathOf(name));
  temporary_.clear();
}

bool StagedFile::isTemporary(const std::string &name) {
  const size_t prefix = sizeof kPrefix - 1;
  return name.size() == prefix + kRandomLetters && name.compare(0, prefix, kPrefix) == 0 &&
         std::all_of(name.begin() + static_cast<std::ptrdiff_t>(prefix), name.end(),
                     [](unsigned char letter) { return std::isalnum(letter) != 0; });
}

}  // namespace Install
