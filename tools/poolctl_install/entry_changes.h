// SPDX-License-Identifier: Apache-2.0
// A set of changes to the entries of the definition folder: all of them happen, or none. A journal
// in the folder lets the next run undo the changes of a run that was killed.
#pragma once

#include <string>
#include <vector>

#include "definition_folder.h"
#include "staged_file.h"

namespace Install {

class EntryChanges {
 public:
  // Undoes what a killed run has left in the folder, and removes its temporary files. Returns
  // whether entries had to be put back. Throws std::system_error or std::runtime_error.
  static bool recover(const DefinitionFolder &folder);

  // Keeps a second name of each entry that is there, and writes the journal. Throws
  // std::system_error; nothing has changed then.
  EntryChanges(const DefinitionFolder &folder, const std::vector<std::string> &names);
  // Undoes the changes unless they were kept. Prints what it could not undo to standard error;
  // then the journal stays, and the next run tries again.
  ~EntryChanges();
  EntryChanges(const EntryChanges &) = delete;
  EntryChanges &operator=(const EntryChanges &) = delete;

  // Throw std::system_error; the entry is then as it was.
  void replace(const std::string &name, StagedFile &file);
  void remove(const std::string &name);

  // Writes the changes to the disk and makes them permanent. Throws std::system_error; they are
  // undone then.
  void keep();

 private:
  struct Entry {
    std::string name;
    std::string backup;  // the second name of what was there; empty: nothing was
  };

  static std::vector<Entry> readJournal(const DefinitionFolder &folder);
  static void undo(const DefinitionFolder &folder, const std::vector<Entry> &entries);
  static void undoOne(const DefinitionFolder &folder, const Entry &entry);
  static void removeBackups(const DefinitionFolder &folder, const std::vector<Entry> &entries);
  void backUp(const std::string &name);
  void writeJournal();

  const DefinitionFolder &folder_;
  std::vector<Entry> entries_;
  bool pending_ = false;  // the journal is there
};

}  // namespace Install
