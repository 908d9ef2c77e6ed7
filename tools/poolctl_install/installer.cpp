// SPDX-License-Identifier: Apache-2.0
// Checks everything first, then changes the entries one by one, and takes the changes back in
// reverse order when one of them fails.
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
#include "installed_mark.h"
#include "loader/definition_files.h"
#include "shared/tool.h"

namespace Install {
namespace {

using Changes = std::vector<std::unique_ptr<EntryChange>>;

// Names with a leading dot are never read, and a name with a slash would lead elsewhere.
void checkEntryName(const std::string &name, const std::string &given) {
  if (name.empty() || name[0] == '.' || name.find('/') != std::string::npos)
    throw Tools::Failure(Tools::kExitUsage, "'" + given + "': no name for an installed file");
}

// A second entry of one name would silently take the place of the first.
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

// What is checked is what will be installed: the staged copy. The message names the user's file.
void checkStaged(const StagedFile &staged, const std::string &source) {
  try {
    (void)Loader::readFile(staged.path());
  } catch (const std::exception &error) {
    const std::string message = error.what();
    const std::string path = staged.path();
    if (message.compare(0, path.size(), path) != 0) throw;
    throw std::runtime_error(source + message.substr(path.size()));
  }
}

template <typename Undoable>
void undoAll(std::vector<std::unique_ptr<Undoable>> &changes) {
  for (auto change = changes.rbegin(); change != changes.rend(); ++change) {
    try {
      (*change)->undo();
    } catch (const std::exception &error) {
      std::cerr << "poolctl-install: not undone: " << error.what() << std::endl;
    }
  }
}

// A mark that this run has set.
class MarkChange {
 public:
  explicit MarkChange(const std::string &path)
      : path_(path), file_(open(path.c_str(), O_RDONLY | O_CLOEXEC)) {
    if (!file_) throwOpenError(path_);
  }
  void set() {
    before_ = readMark(file_.get());
    writeMark(file_.get(), kInstalled, path_);
    set_ = true;
  }
  void undo() {
    if (set_) writeMark(file_.get(), before_, path_);
    set_ = false;
  }

 private:
  const std::string path_;
  const Platform::UniqueFd file_;
  Mark before_;
  bool set_ = false;
};

void checkIsInstalled(const DefinitionFolder &folder, const std::string &name) {
  struct stat info {};
  if (fstatat(folder.fd(), name.c_str(), &info, AT_SYMLINK_NOFOLLOW) != 0)
    throwOpenError(DefinitionFolder::pathOf(name));
  if (!S_ISREG(info.st_mode))
    throw std::runtime_error(DefinitionFolder::pathOf(name) + ": is no regular file");
}

}  // namespace

void installFiles(const std::vector<std::string> &paths) {
  const std::vector<std::string> names = entryNames(paths);
  const DefinitionFolder folder(DefinitionFolder::IfMissing::kCreate);
  std::vector<std::unique_ptr<StagedFile>> staged;
  for (const std::string &path : paths) {
    staged.push_back(std::make_unique<StagedFile>(folder, path));
    checkStaged(*staged.back(), path);
  }
  Changes changes;
  try {
    for (size_t i = 0; i < staged.size(); ++i) {
      changes.push_back(std::make_unique<EntryChange>(folder, names[i]));
      changes.back()->replaceBy(*staged[i]);
    }
    folder.sync();
  } catch (...) {
    undoAll(changes);
    throw;
  }
}

void markFiles(const std::vector<std::string> &paths) {
  std::vector<std::unique_ptr<MarkChange>> changes;
  for (const std::string &path : paths) {
    changes.push_back(std::make_unique<MarkChange>(path));
    (void)Loader::readFile(path);
  }
  try {
    for (const auto &change : changes) change->set();
  } catch (...) {
    undoAll(changes);
    throw;
  }
}

void removeFiles(const std::vector<std::string> &names) {
  for (const std::string &name : names) checkEntryName(name, name);
  const DefinitionFolder folder(DefinitionFolder::IfMissing::kFail);
  for (const std::string &name : names) checkIsInstalled(folder, name);
  Changes changes;
  try {
    for (const std::string &name : names) {
      changes.push_back(std::make_unique<EntryChange>(folder, name));
      changes.back()->remove();
    }
    folder.sync();
  } catch (...) {
    undoAll(changes);
    throw;
  }
}

}  // namespace Install
