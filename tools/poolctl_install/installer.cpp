// SPDX-License-Identifier: Apache-2.0
// Checks everything first, then changes the entries one by one.
#include "installer.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <exception>
#include <iostream>
#include <memory>
#include <set>
#include <stdexcept>
#include <system_error>

#include "definition_folder.h"
#include "entry_changes.h"
#include "files.h"
#include "folder_check.h"
#include "installed_mark.h"
#include "loader/definition_files.h"
#include "shared/tool.h"
#include "signal_guard.h"
#include "staged_file.h"

namespace Install {
namespace {

// Names with a leading dot are never read, and a name with a slash would lead elsewhere.
void checkEntryName(const std::string &name, const std::string &given) {
  if (name.empty() || name[0] == '.' || name.find('/') != std::string::npos)
    throw Tools::Failure(Tools::kExitUsage, "'" + given + "': not a name for an installed file");
}

// Of two files with one name only the second would be installed.
std::vector<std::string> entryNames(const std::vector<std::string> &paths) {
  std::vector<std::string> names;
  std::set<std::string> seen;
  for (const std::string &path : paths) {
    names.push_back(path.substr(path.rfind('/') + 1));
    checkEntryName(names.back(), path);
    if (!seen.insert(names.back()).second)
      throw Tools::Failure(Tools::kExitUsage, path + ": another file of this name is given too");
  }
  return names;
}

// The copies are checked, since they are what will be installed.
std::vector<NewFile> newFiles(const std::vector<std::string> &paths,
                              const std::vector<std::string> &names,
                              const std::vector<std::unique_ptr<StagedFile>> &staged) {
  std::vector<NewFile> files;
  for (size_t i = 0; i < paths.size(); ++i) {
    files.push_back({names[i], paths[i], staged[i]->path()});
  }
  return files;
}

// A mark that this run sets. Between two steps the file is closed, because a run may mark more
// files than a process may have open.
class MarkChange {
 public:
  explicit MarkChange(const std::string &path) : path_(path) { (void)open(); }

  void set() {
    const Platform::UniqueFd file = open();
    before_ = readMark(file.get());
    writeMark(file.get(), kInstalled, path_);
    set_ = true;
  }

  void undo() {
    if (set_) writeMark(open().get(), before_, path_);
    set_ = false;
  }

 private:
  // Throws std::runtime_error when the path now leads to another file than the first time.
  Platform::UniqueFd open() {
    Platform::UniqueFd file = openRegularFile(path_);
    struct stat info {};
    if (fstat(file.get(), &info) != 0) throwSystemError(path_);
    if (inode_ == 0) {
      device_ = info.st_dev;
      inode_ = info.st_ino;
    }
    if (info.st_dev != device_ || info.st_ino != inode_)
      throw std::runtime_error(path_ + ": replaced by another file meanwhile");
    return file;
  }

  const std::string path_;
  dev_t device_ = 0;
  ino_t inode_ = 0;  // 0: not opened yet
  Mark before_;
  bool set_ = false;
};

void undoMarks(std::vector<MarkChange> &changes) {
  for (auto change = changes.rbegin(); change != changes.rend(); ++change) {
    try {
      change->undo();
    } catch (const std::exception &error) {
      std::cerr << "poolctl-install: not undone: " << error.what() << std::endl;
    }
  }
}

void checkIsInstalled(const DefinitionFolder &folder, const std::string &name) {
  struct stat info {};
  if (fstatat(folder.fd(), name.c_str(), &info, AT_SYMLINK_NOFOLLOW) != 0)
    throwOpenError(DefinitionFolder::pathOf(name));
  if (!S_ISREG(info.st_mode))
    throw std::runtime_error(DefinitionFolder::pathOf(name) + ": not a regular file");
}

void recover(const DefinitionFolder &folder) {
  if (EntryChanges::recover(folder)) {
    std::cerr << "poolctl-install: " << Loader::kDefinitionFolder
              << ": undid the changes of an earlier run that was killed" << std::endl;
  }
}

void warnOfOthers(const DefinitionFolder &folder) {
  if (folder.othersMayWrite()) {
    std::cerr << "poolctl-install: warning: " << Loader::kDefinitionFolder
              << ": other users may change the definition files in it" << std::endl;
  }
}

}  // namespace

void installFiles(const std::vector<std::string> &paths, Errors errors) {
  const std::vector<std::string> names = entryNames(paths);
  const SignalGuard signals;
  const DefinitionFolder folder(DefinitionFolder::IfMissing::kCreate, signals);
  recover(folder);
  std::vector<std::unique_ptr<StagedFile>> staged;
  for (const std::string &path : paths) {
    signals.check();
    staged.push_back(std::make_unique<StagedFile>(folder, path));
  }
  FolderCheck check(newFiles(paths, names, staged));
  check.run(errors);
  for (const auto &file : staged) {
    signals.check();
    file->finish();
  }
  signals.check();
  EntryChanges changes(folder, names);
  for (size_t i = 0; i < staged.size(); ++i) changes.replace(names[i], *staged[i]);
  changes.keep();
  warnOfOthers(folder);
  check.reportLoadedPools();
}

void markFiles(const std::vector<std::string> &paths) {
  const SignalGuard signals;
  std::vector<MarkChange> changes;
  for (const std::string &path : paths) {
    signals.check();
    changes.emplace_back(path);
    (void)Loader::readFile(path);
  }
  try {
    for (MarkChange &change : changes) {
      signals.check();
      change.set();
    }
  } catch (...) {
    undoMarks(changes);
    throw;
  }
}

void removeFiles(const std::vector<std::string> &names) {
  for (const std::string &name : names) checkEntryName(name, name);
  const SignalGuard signals;
  const DefinitionFolder folder(DefinitionFolder::IfMissing::kFail, signals);
  recover(folder);
  for (const std::string &name : names) checkIsInstalled(folder, name);
  EntryChanges changes(folder, names);
  for (const std::string &name : names) changes.remove(name);
  changes.keep();
  warnOfOthers(folder);
}

}  // namespace Install
