// SPDX-License-Identifier: Apache-2.0
// Nothing here may open the store's file except through SQLite: closing any other descriptor of it
// would give up the locks that a connection of this process holds.
#include "kestrel/sqlite_file.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <system_error>

#include "common/unique_fd.h"
#include "kestrel/errors.h"
#include "kestrel/sqlite_tables.h"

namespace Kestrel {

namespace {

using Platform::Database;
using Platform::SqliteError;

// How long one writer waits for another. A transaction of this store takes milliseconds.
constexpr int kWriterWaitMs = 10000;

std::string systemText(int error) {
  return std::generic_category().message(error);
}

FileState existing(const std::string &path) {
  const auto state = fileState(path);
  if (!state) throw storeError(path, systemText(ENOENT));
  return *state;
}

// SQLite reports only "unable to open"; this reports the system's reason.
void checkReadable(const std::string &path) {
  if (faccessat(AT_FDCWD, path.c_str(), R_OK, AT_EACCESS) == 0) return;
  const int error = errno;
  throw storeError(path, "cannot be read", systemText(error));
}

// true when every change is in the file itself and none in the log beside it.
bool logIsEmpty(const std::string &path) {
  struct stat log {};
  if (stat((path + "-wal").c_str(), &log) != 0) return errno == ENOENT;
  return log.st_size == 0;
}

// A database beside PATH that is removed again, with the files that SQLite puts beside it.
class ScratchFile {
 public:
  explicit ScratchFile(const std::string &path) : path_(path + ".new-" + std::to_string(getpid())) {
    remove();  // left by a process of the same number that was killed
    const Platform::UniqueFd fd(
        open(path_.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0644));
    const int error = errno;
    if (!fd) throw storeError(path, "cannot be made", systemText(error));
  }
  ~ScratchFile() { remove(); }
  ScratchFile(const ScratchFile &) = delete;
  ScratchFile &operator=(const ScratchFile &) = delete;

  const std::string &path() const { return path_; }

 private:
  void remove() const {
    for (const char *ending : {"", "-wal", "-shm", "-journal"}) {
      (void)unlink((path_ + ending).c_str());
    }
  }

  std::string path_;
};

void makeFolder(const std::filesystem::path &folder) {
  std::error_code error;
  std::filesystem::create_directories(folder, error);
  if (error) throw storeError(folder.string(), "cannot be made", error.message());
}

// A store is published only when all of it is in its file. SQLite does not report that closing a
// database could not move its log into the file, as on a full disk.
void checkComplete(const std::string &path) {
  Database database(path, Database::Mode::kImmutable, 0);
  checkSchema(database, path);
  (void)describeTables(database);
}

// Makes the new name outlive a loss of power, as the transactions that follow do.
void syncFolder(const std::filesystem::path &folder) {
  const Platform::UniqueFd fd(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (fd) (void)fsync(fd.get());  // some file systems have no such thing
}

}  // namespace

std::optional<FileState> fileState(const std::string &path) {
  struct stat found {};
  if (stat(path.c_str(), &found) != 0) {
    const int error = errno;
    if (error == ENOENT) return std::nullopt;
    throw storeError(path, systemText(error));
  }
  if (!S_ISREG(found.st_mode)) throw storeError(path, "is not a regular file");
  constexpr int64_t kNsPerSecond = 1000000000;
  return FileState{found.st_dev, found.st_ino, found.st_size,
                   found.st_mtim.tv_sec * kNsPerSecond + found.st_mtim.tv_nsec};
}

ReadableFile::ReadableFile(const std::string &path, std::chrono::milliseconds timeout)
    : path_(path), state_(existing(path)) {
  checkReadable(path);
  if (openedLocked(timeout)) return;
  immutable_ = true;
  database_ = std::make_unique<Database>(path_, Database::Mode::kImmutable, 0);
  checkSchema(*database_, path_);
}

bool ReadableFile::openedLocked(std::chrono::milliseconds timeout) {
  try {
    database_ = std::make_unique<Database>(path_, Database::Mode::kReadOnly,
                                           static_cast<int>(timeout.count()));
    checkSchema(*database_, path_);
    return true;
  } catch (const SqliteError &error) {
    const bool filesMissing = error.code == SQLITE_CANTOPEN || error.code == SQLITE_READONLY;
    if (!filesMissing || !logIsEmpty(path_)) throw;
  }
  database_.reset();
  return false;
}

bool ReadableFile::consistent() const {
  return !immutable_ || (logIsEmpty(path_) && fileState(path_) == state_);
}

bool ReadableFile::inPlace() const {
  const auto now = fileState(path_);
  return now && now->sameFile(state_);
}

void createStore(const std::string &path) {
  if (fileState(path)) return;
  const std::filesystem::path folder = std::filesystem::path(path).parent_path();
  makeFolder(folder);
  const ScratchFile scratch(path);
  {
    // Without the log every page is in the file when the transaction ends; the last step only sets
    // the mode of later changes in the file's header.
    Database database(scratch.path(), Database::Mode::kReadWrite, 0);
    createSchema(database);
    database.execute("PRAGMA journal_mode = WAL");
  }
  checkComplete(scratch.path());
  if (link(scratch.path().c_str(), path.c_str()) != 0 && errno != EEXIST) {
    const int error = errno;
    throw storeError(path, "cannot be made", systemText(error));
  }
  syncFolder(folder);
}

std::unique_ptr<Database> openForWriting(const std::string &path) {
  checkReadable(path);
  auto database = std::make_unique<Database>(path, Database::Mode::kReadWrite, kWriterWaitMs);
  checkSchema(*database, path);
  // The log stays when the last writer closes, empty: a reader who may not make one beside the
  // store finds it there.
  int keep = 1;
  (void)Platform::sqliteLibrary().file_control(database->get(), "main", SQLITE_FCNTL_PERSIST_WAL,
                                               &keep);
  database->execute(
      "PRAGMA journal_mode = WAL; PRAGMA journal_size_limit = 0; PRAGMA foreign_keys = ON");
  return database;
}

}  // namespace Kestrel
