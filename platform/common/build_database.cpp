// SPDX-License-Identifier: Apache-2.0
// SQLite reports no error of a close, although the close writes the log back into the database. So
// the log is written back before, and the file is read again after.
#include "common/build_database.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>

#include "common/unique_fd.h"

namespace Platform {
namespace {

class RemoveUnlessBuilt {
 public:
  explicit RemoveUnlessBuilt(const std::string &file) : file_(file) {}
  ~RemoveUnlessBuilt() {
    if (!built_) removeDatabase(file_);
  }
  RemoveUnlessBuilt(const RemoveUnlessBuilt &) = delete;
  RemoveUnlessBuilt &operator=(const RemoveUnlessBuilt &) = delete;

  void setBuilt() { built_ = true; }

 private:
  const std::string &file_;
  bool built_ = false;
};

void writeBackLog(Database &database) {
  Statement checkpoint(database, "PRAGMA wal_checkpoint(TRUNCATE)");
  Query query(checkpoint);
  const bool incomplete = query.step() && query.integer(0) != 0;
  if (incomplete) throw SqliteError(SQLITE_BUSY, "the log cannot be written back");
}

void requireWhole(const std::string &file) {
  if (::access((file + "-wal").c_str(), F_OK) == 0) {
    throw SqliteError(SQLITE_IOERR, "the log was not written back");
  }
  Database database(file, Database::Mode::kImmutable, 0);
  Statement check(database, "PRAGMA quick_check(1)");
  Query query(check);
  const std::string result = query.step() ? query.text(0) : "no result";
  if (result != "ok") throw SqliteError(SQLITE_CORRUPT, result);
}

void flush(const std::string &file) {
  const UniqueFd fd(::open(file.c_str(), O_RDONLY | O_CLOEXEC));
  if (fd && ::fsync(fd.get()) == 0) return;
  throw SqliteError(SQLITE_IOERR_FSYNC, std::generic_category().message(errno));
}

}  // namespace

void buildDatabase(const std::string &file, const std::function<void(Database &)> &fill) {
  removeDatabase(file);
  RemoveUnlessBuilt guard(file);
  {
    Database database(file, Database::Mode::kCreate, 0);
    fill(database);
    writeBackLog(database);
  }
  requireWhole(file);
  flush(file);
  guard.setBuilt();
}

void removeDatabase(const std::string &file) noexcept {
  // The name itself comes last: the others are nothing without it.
  for (const char *ending : {"-wal", "-shm", "-journal", ""}) {
    try {
      (void)::unlink((file + ending).c_str());
    } catch (const std::exception &) {  // no memory for the name
    }
  }
}

}  // namespace Platform
