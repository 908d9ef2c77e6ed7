// SPDX-License-Identifier: Apache-2.0
// A file is complete, marked and on the disk before it gets its name; the old one keeps a second
// name until the change is kept.
#include "definition_folder.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <system_error>

#include "installed_mark.h"
#include "loader/definition_files.h"
#include "shared/tool.h"

namespace Install {
namespace {

constexpr mode_t kFolderMode = 0755;
constexpr mode_t kFileMode = 0644;

void writeAll(int file, const char *data, size_t size, const std::string &path) {
  while (size > 0) {
    const ssize_t written = write(file, data, size);
    if (written < 0) {
      if (errno == EINTR) continue;
      throwSystemError(path);
    }
    data += written;
    size -= static_cast<size_t>(written);
  }
}

}  // namespace

void throwSystemError(const std::string &path) {
  throw std::system_error(errno, std::generic_category(), path);
}

void throwOpenError(const std::string &path) {
  if (errno != ENOENT) throwSystemError(path);
  throw Tools::Failure(Tools::kExitNotFound, path + ": " + std::generic_category().message(ENOENT));
}

DefinitionFolder::DefinitionFolder(IfMissing ifMissing) {
  const char *const path = Loader::kDefinitionFolder;
  if (ifMissing == IfMissing::kCreate) {
    created_ = mkdir(path, kFolderMode) == 0;
    if (!created_ && errno != EEXIST) throwSystemError(path);
  }
  fd_ = Platform::UniqueFd(open(path, O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!fd_) throwOpenError(path);
  // Whatever the umask made of it.
  if (created_ && fchmod(fd(), kFolderMode) != 0) throwSystemError(path);
}

DefinitionFolder::~DefinitionFolder() {
  if (created_) (void)rmdir(Loader::kDefinitionFolder);  // refused unless it is empty
}

std::string DefinitionFolder::pathOf(const std::string &name) {
  return std::string(Loader::kDefinitionFolder) + "/" + name;
}

void DefinitionFolder::sync() const {
  if (fsync(fd()) != 0) throwSystemError(Loader::kDefinitionFolder);
}

StagedFile::StagedFile(const DefinitionFolder &folder, const std::string &source)
    : folder_(folder), temporary_(".install.XXXXXX") {
  std::string path = DefinitionFolder::pathOf(temporary_);
  file_ = Platform::UniqueFd(mkostemp(path.data(), O_CLOEXEC));
  if (!file_) throwSystemError(Loader::kDefinitionFolder);
  temporary_ = path.substr(path.rfind('/') + 1);
  try {
    copyAndMark(source);
  } catch (...) {
    (void)unlinkat(folder_.fd(), temporary_.c_str(), 0);
    throw;
  }
}

StagedFile::~StagedFile() {
  if (!temporary_.empty()) (void)unlinkat(folder_.fd(), temporary_.c_str(), 0);
}

void StagedFile::copyAndMark(const std::string &source) {
  const Platform::UniqueFd from(open(source.c_str(), O_RDONLY | O_CLOEXEC));
  if (!from) throwOpenError(source);
  char buffer[65536];
  for (;;) {
    const ssize_t size = read(from.get(), buffer, sizeof buffer);
    if (size == 0) break;
    if (size > 0) {
      writeAll(file_.get(), buffer, static_cast<size_t>(size), Loader::kDefinitionFolder);
    } else if (errno != EINTR) {
      throwSystemError(source);
    }
  }
  writeMark(file_.get(), kInstalled, Loader::kDefinitionFolder);
  if (fchmod(file_.get(), kFileMode) != 0) throwSystemError(path());
  if (fsync(file_.get()) != 0) throwSystemError(path());
}

void StagedFile::placeAs(const std::string &name) {
  if (renameat(folder_.fd(), temporary_.c_str(), folder_.fd(), name.c_str()) != 0)
    throwSystemError(DefinitionFolder::pathOf(name));
  temporary_.clear();
}

EntryChange::EntryChange(const DefinitionFolder &folder, const std::string &name)
    : folder_(folder), name_(name) {
  // Names that a killed run of the same process id left behind are passed over.
  for (int number = 0;; ++number) {
    const std::string backup = ".old." + std::to_string(getpid()) + "." + std::to_string(number);
    if (linkat(folder_.fd(), name_.c_str(), folder_.fd(), backup.c_str(), 0) == 0) {
      backup_ = backup;
      return;
    }
    if (errno == ENOENT) return;
    if (errno != EEXIST) throwSystemError(DefinitionFolder::pathOf(name_));
  }
}

EntryChange::~EntryChange() {
  if (!backup_.empty()) (void)unlinkat(folder_.fd(), backup_.c_str(), 0);
}

void EntryChange::replaceBy(StagedFile &file) {
  file.placeAs(name_);
  changed_ = true;
}

void EntryChange::remove() {
  if (unlinkat(folder_.fd(), name_.c_str(), 0) != 0)
    throwSystemError(DefinitionFolder::pathOf(name_));
  changed_ = true;
}

void EntryChange::undo() {
  if (!changed_) return;
  const int result = backup_.empty()
                         ? unlinkat(folder_.fd(), name_.c_str(), 0)
                         : renameat(folder_.fd(), backup_.c_str(), folder_.fd(), name_.c_str());
  if (result != 0) throwSystemError(DefinitionFolder::pathOf(name_));
  changed_ = false;
  backup_.clear();
}

}  // namespace Install
