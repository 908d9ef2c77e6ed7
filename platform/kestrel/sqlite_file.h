// SPDX-License-Identifier: Apache-2.0
// The SQLite store as a file: whether it exists and may be read, and how it is opened and made.
// sqlite_tables has its content.
#pragma once

#include <sys/stat.h>

#include <chrono>
#include <memory>
#include <optional>
#include <string>

#include "common/sqlite.h"

namespace Kestrel {

// What distinguishes two states of a file without reading it.
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

// Empty: the file does not exist. Throws a ConfigStoreException when that cannot be determined.
std::optional<FileState> fileState(const std::string &path);

// A file opened for reading. Usually SQLite takes part in the locking of a WAL database. Where it
// cannot, because the reader may not make the files beside the database that this needs (a folder
// of root's, a read-only medium), the file alone is read for as long as no process writes it.
class ReadableFile {
 public:
  // The file must exist. Throws a ConfigStoreException for a file that is not a store, and
  // SqliteError for one that SQLite cannot open or read.
  ReadableFile(const std::string &path, std::chrono::milliseconds timeout);

  Platform::Database &database() { return *database_; }

  // false: what was read since the opening may be part of a change; open the file again. Always
  // true where SQLite takes part in the locking.
  bool consistent() const;

  // Whether the file at the path is still the one that was opened.
  bool inPlace() const;

 private:
  bool openedLocked(std::chrono::milliseconds timeout);

  std::string path_;
  FileState state_;
  bool immutable_ = false;
  std::unique_ptr<Platform::Database> database_;
};

// Makes an empty store where there is none, and its folder. No process ever sees an incomplete one:
// a failure leaves no file. An existing store stays as it is.
void createStore(const std::string &path);

// Opens an existing store for writing. Throws as ReadableFile does.
std::unique_ptr<Platform::Database> openForWriting(const std::string &path);

}  // namespace Kestrel
