// SPDX-License-Identifier: Apache-2.0
// A file that will become an entry of the definition folder.
#pragma once

#include <string>

#include "definition_folder.h"

namespace Install {

// A copy of a file, in the folder, under a name that no reader looks at. It is removed unless it
// is put in place. Only its owner can read it until it has been finished.
class StagedFile {
 public:
  // Throws what openRegularFile() and copyContent() throw.
  StagedFile(const DefinitionFolder &folder, const std::string &source);
  ~StagedFile();
  StagedFile(const StagedFile &) = delete;
  StagedFile &operator=(const StagedFile &) = delete;

  std::string path() const { return DefinitionFolder::pathOf(temporary_); }

  // Marks the copy as installed, makes it readable for all and writes it to the disk. Throws
  // std::system_error or std::runtime_error.
  void finish();

  // Gives it the name of an entry, whose place it takes. Throws std::system_error.
  void placeAs(const std::string &name);

  // Whether a name in the folder is that of a staged file, which a killed run has left.
  static bool isTemporary(const std::string &name);

 private:
  const DefinitionFolder &folder_;
  std::string temporary_;  // empty: it is in place
};

}  // namespace Install
