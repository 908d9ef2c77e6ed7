// SPDX-License-Identifier: Apache-2.0
// The folder of the installed definition files, and changes to its entries. A change becomes
// visible in one step and can be taken back until it is kept. What is under way carries a name with
// a leading dot, which no reader of the folder looks at.
#pragma once

#include <string>

#include "common/unique_fd.h"

namespace Install {

// Throws std::system_error with the errno and the path.
[[noreturn]] void throwSystemError(const std::string &path);
// For something that the command line names: throws Tools::Failure when it does not exist.
[[noreturn]] void throwOpenError(const std::string &path);

class DefinitionFolder {
 public:
  enum class IfMissing { kFail, kCreate };

  // A folder that was made here is removed again when it is empty in the end. Throws
  // std::system_error.
  explicit DefinitionFolder(IfMissing ifMissing);
  ~DefinitionFolder();
  DefinitionFolder(const DefinitionFolder &) = delete;
  DefinitionFolder &operator=(const DefinitionFolder &) = delete;

  int fd() const { return fd_.get(); }
  static std::string pathOf(const std::string &name);

  // Makes renames and removals last. Throws std::system_error.
  void sync() const;

 private:
  bool created_ = false;
  Platform::UniqueFd fd_;
};

// A new file of the folder, with the content of another one and the installed mark, under a name
// that no reader sees. It is removed unless it is put in place.
class StagedFile {
 public:
  // Throws std::system_error or std::runtime_error, naming the source or the folder.
  StagedFile(const DefinitionFolder &folder, const std::string &source);
  ~StagedFile();
  StagedFile(const StagedFile &) = delete;
  StagedFile &operator=(const StagedFile &) = delete;

  std::string path() const { return DefinitionFolder::pathOf(temporary_); }

  // Takes the name of an entry, and the place of what had it. Throws std::system_error.
  void placeAs(const std::string &name);

 private:
  void copyAndMark(const std::string &source);

  const DefinitionFolder &folder_;
  std::string temporary_;  // empty: it is in place
  Platform::UniqueFd file_;
};

// One entry that is about to be replaced, made or removed. Until keep(), undo() brings it back.
class EntryChange {
 public:
  // Throws std::system_error; the entry is untouched.
  EntryChange(const DefinitionFolder &folder, const std::string &name);
  ~EntryChange();
  EntryChange(const EntryChange &) = delete;
  EntryChange &operator=(const EntryChange &) = delete;

  // Throw std::system_error; the entry is as it was then.
  void replaceBy(StagedFile &file);
  void remove();

  // Throws std::system_error when the entry could not be brought back.
  void undo();

 private:
  const DefinitionFolder &folder_;
  const std::string name_;
  std::string backup_;  // a second name of the old entry; empty: there was none
  bool changed_ = false;
};

}  // namespace Install
