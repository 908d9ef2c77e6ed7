// SPDX-License-Identifier: Apache-2.0
// SQLite with owners: a Database, its Statements, one Query of a statement, and a Transaction that
// is rolled back unless it was committed. A failure is a SqliteError with SQLite's own code.
//
// Declare a Database before its Statements: they must be released before it.
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>

#include "common/sqlite_library.h"

namespace Platform {

class SqliteError : public std::runtime_error {
 public:
  SqliteError(int resultCode, const std::string &message)
      : std::runtime_error(message), code(resultCode & 0xff), extendedCode(resultCode) {}

  const int code;          // SQLITE_BUSY, SQLITE_CORRUPT, ...
  const int extendedCode;  // the same with its particulars
};

class Database {
 public:
  // kImmutable reads a file that no process writes: without locks, and without the files that
  // SQLite puts beside a database. The caller makes sure that the file does not change.
  enum class Mode { kReadOnly, kReadWrite, kCreate, kImmutable };

  // One thread at a time uses a Database and all that belongs to it. busyMs: how long a call waits
  // for another process, by the clock, before it fails with SQLITE_BUSY.
  Database(const std::string &path, Mode mode, int busyMs);

  // Runs one or several statements whose rows are not needed.
  void execute(const char *sql);

  int64_t lastInsertId() const { return sqliteLibrary().last_insert_rowid(handle_.get()); }
  int64_t changedRows() const { return sqliteLibrary().changes(handle_.get()); }
  sqlite3 *get() const { return handle_.get(); }

  // Throws the error that a call on this database has just returned.
  [[noreturn]] void fail(int resultCode) const;

 private:
  struct Closer {
    void operator()(sqlite3 *handle) const { sqliteLibrary().close(handle); }
  };
  // How long the call in progress may wait for another process.
  struct Wait {
    std::chrono::milliseconds limit;
    std::chrono::steady_clock::time_point began;
  };
  static int waitForOthers(void *wait, int round);

  std::unique_ptr<Wait> wait_;  // SQLite keeps its address as long as the handle lives
  std::unique_ptr<sqlite3, Closer> handle_;
};

// A text to be run any number of times. The first run prepares it, so that a program pays only for
// what it uses.
class Statement {
 public:
  Statement(Database &database, std::string sql) : database_(database), sql_(std::move(sql)) {}

  Database &database() const { return database_; }
  sqlite3_stmt *get() {
    if (!handle_) prepare();
    return handle_.get();
  }

 private:
  struct Finalizer {
    void operator()(sqlite3_stmt *handle) const { sqliteLibrary().finalize(handle); }
  };
  void prepare();

  Database &database_;
  std::string sql_;
  std::unique_ptr<sqlite3_stmt, Finalizer> handle_;
};

// One run of a statement, with its arguments; the destructor resets the statement. Texts are not
// copied: they must outlive the query. A statement has one query at a time.
class Query {
 public:
  template <typename... Arguments>
  explicit Query(Statement &statement, const Arguments &...arguments)
      : database_(statement.database()), statement_(statement.get()) {
    int position = 0;
    (bind(++position, arguments), ...);
  }
  ~Query();
  Query(const Query &) = delete;
  Query &operator=(const Query &) = delete;

  // Goes to the next row; false when there is none.
  bool step();
  // For a statement without rows.
  void finish() {
    while (step()) {
    }
  }

  bool isNull(int column) const { return type(column) == SQLITE_NULL; }
  int type(int column) const { return sqliteLibrary().column_type(statement_, column); }
  int64_t integer(int column) const { return sqliteLibrary().column_int64(statement_, column); }
  double real(int column) const { return sqliteLibrary().column_double(statement_, column); }
  std::string text(int column) const;

 private:
  void bind(int position, int64_t value);
  void bind(int position, int value) { bind(position, static_cast<int64_t>(value)); }
  void bind(int position, double value);
  void bind(int position, std::string_view text);
  void bind(int position, const char *text) { bind(position, std::string_view(text)); }
  void bind(int position, const std::string &text) { bind(position, std::string_view(text)); }
  void bind(int position, std::nullptr_t);
  void check(int resultCode) const;

  Database &database_;
  sqlite3_stmt *statement_;
};

using Run = Query;  // the name that the store's tables still use

// The statements that begin and end transactions, kept for each database.
class TransactionStatements {
 public:
  explicit TransactionStatements(Database &database)
      : read(database, "BEGIN DEFERRED"),
        write(database, "BEGIN IMMEDIATE"),
        commit(database, "COMMIT"),
        rollback(database, "ROLLBACK") {}

  Statement read, write, commit, rollback;
};

class Transaction {
 public:
  enum class Kind { kRead, kWrite };

  // Prepares the rollback before it begins: ending it must not need memory.
  Transaction(TransactionStatements &statements, Kind kind);
  ~Transaction();
  Transaction(const Transaction &) = delete;
  Transaction &operator=(const Transaction &) = delete;

  void commit();

 private:
  TransactionStatements &statements_;
  bool open_ = true;
};

}  // namespace Platform
