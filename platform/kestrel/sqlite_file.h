// SPDX-License-Identifier: Apache-2.0
// The SQLite store as a file: is it there, may it be read, how is it opened, how is it made. What
// stands in it is the backend's business.
#pragma once

#include <sys/stat.h>

#include <chrono>
#include <memory>
#include <optional>
#include <string>

#include "common/sqlite.h"

namespace Kestrel {

// What tells one state of a file from another without reading it.
struct FileState {
  dev_t device = 0;
  ino_t inode = 0;
  off_t size = 0;
  int64_t modifiedNs = 0;

  bool sameFile(const FileState &other) const {
    return device == other.device && inode == other.inode;
  }
  bool operator==(const FileState &other) const {
    return sameFile(other) && size == other.size && modifiedNs == other.modifiedNs;
  }
};

// Nothing: there is no such file. Throws a ConfigStoreException when that cannot be told.
std::optional<FileState> fileState(const std::string &path);

// A file opened for reading. Usually SQLite takes part in the locking of a WAL database; where it
// cannot, because the reader may not make the files beside the database that this needs (a folder
// of root's, a read-only medium), the file alone is read for as long as nobody writes it.
class ReadableFile {
 public:
  // The file must exist. Throws a ConfigStoreException for one that is no store, and SqliteError
  // for one that SQLite cannot open or read.
  ReadableFile(const std::string &path, std::chrono::milliseconds timeout);

  Platform::Database &database() { return *database_; }

  // false: what was read since the opening may be half of a change; open the file again. Always
  // true where SQLite takes part in the locking.
  bool consistent() const;

  // The file that is now at the path is the one that was opened.
  bool inPlace() const;

 private:
  bool openedLocked(std::chrono::milliseconds timeout);

  std::string path_;
  FileState state_;
  bool immutable_ = false;
  std::unique_ptr<Platform::Database> database_;
};

// Makes an empty store where there is none, whole at once: no reader ever sees a half-made one.
// Makes its folder too. A store that is there already stays as it is.
void createStore(const std::string &path);

// Opens an existing store for writing. Throws as ReadableFile does.
std::unique_ptr<Platform::Database> openForWriting(const std::string &path);

}  // namespace Kestrel
