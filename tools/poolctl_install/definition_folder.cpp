// SPDX-License-Identifier: Apache-2.0
#include "definition_folder.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <memory>

#include "files.h"
#include "loader/definition_files.h"

namespace Install {
namespace {

constexpr mode_t kFolderMode = 0755;

struct CloseFolder {
  void operator()(DIR *folder) const { (void)closedir(folder); }
};

}  // namespace

DefinitionFolder::Created::~Created() {
  if (here) (void)rmdir(Loader::kDefinitionFolder);
}

DefinitionFolder::DefinitionFolder(IfMissing ifMissing, const SignalGuard &signals) {
  const char *const path = Loader::kDefinitionFolder;
  if (ifMissing == IfMissing::kCreate) {
    created_.here = mkdir(path, kFolderMode) == 0;
    if (!created_.here && errno != EEXIST) throwSystemError(path);
  }
  fd_ = Platform::UniqueFd(open(path, O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!fd_) throwOpenError(path);
  // The umask may have taken bits away.
  if (created_.here && fchmod(fd(), kFolderMode) != 0) throwSystemError(path);
  lock_.emplace(fd(), signals);
}

std::string DefinitionFolder::pathOf(const std::string &name) {
  return std::string(Loader::kDefinitionFolder) + "/" + name;
}

bool DefinitionFolder::othersMayWrite() const {
  struct stat info {};
  if (fstat(fd(), &info) != 0) throwSystemError(Loader::kDefinitionFolder);
  return (info.st_mode & (S_IWGRP | S_IWOTH)) != 0 || info.st_uid != geteuid();
}

std::vector<std::string> DefinitionFolder::entries() const {
  const std::unique_ptr<DIR, CloseFolder> folder(opendir(Loader::kDefinitionFolder));
  if (!folder) throwSystemError(Loader::kDefinitionFolder);
  std::vector<std::string> names;
  for (;;) {
    errno = 0;
    const dirent *const entry = readdir(folder.get());
    if (entry == nullptr) break;
    const std::string name = entry->d_name;
    if (name != "." && name != "..") names.push_back(name);
  }
  if (errno != 0) throwSystemError(Loader::kDefinitionFolder);
  return names;
}

void DefinitionFolder::sync() const {
  if (fsync(fd()) != 0) throwSystemError(Loader::kDefinitionFolder);
}

}  // namespace Install
