// SPDX-License-Identifier: Apache-2.0
// One transaction an operation. A reader keeps its file open and its one lookup prepared; a writer
// opens the file for the one change.
#include "kestrel/sqlite_backend.h"

#include "common/sqlite.h"
#include "kestrel/errors.h"
#include "kestrel/sqlite_file.h"
#include "kestrel/sqlite_rows.h"

namespace Kestrel {

namespace {

using Platform::Database;
using Platform::SqliteError;
using Platform::Statement;
using Platform::Transaction;
using Platform::TransactionStatements;

std::string reason(const SqliteError &error) {
  switch (error.code) {
    case SQLITE_BUSY:
      return "another process keeps it locked";
    case SQLITE_CORRUPT:
    case SQLITE_NOTADB:
      return std::string("the file is damaged: ") + error.what();
    default:
      return error.what();
  }
}

// Runs one operation and gives what SQLite finds wrong the words of a store.
template <typename Operation>
void withPlace(const std::string &path, const Operation &operation) {
  try {
    operation();
  } catch (const SqliteError &error) {
    throw storeError(path, reason(error));
  }
}

// What one opening of the file leads to. The statement is released before the database.
struct Session {
  Session(const std::string &path, std::chrono::milliseconds timeout)
      : file(path, timeout), lookUp(file.database(), kLookUp) {}

  ReadableFile file;
  Statement lookUp;
};

class SqliteBackend : public Backend {
 public:
  SqliteBackend(std::string path, std::chrono::milliseconds timeout)
      : path_(std::move(path)), timeout_(timeout) {
    withPlace(path_, [&] { reopen(); });
  }

  std::optional<Fields> read(const ObjectId &id) override {
    std::optional<Fields> fields;
    consistently([&] { fields = lookUp(session_->lookUp, id); });
    return fields;
  }

  std::vector<StoredObject> list(const Selection &selection) override {
    std::vector<StoredObject> objects;
    consistently([&] { objects = selectObjects(session_->file.database(), selection); });
    return objects;
  }

  void setField(const ObjectId &id, const std::string &field, const Value &value) override {
    change([&](Database &database) { putField(database, id, field, value); });
  }

  bool removeField(const ObjectId &id, const std::string &field) override {
    bool removed = false;
    change([&](Database &database) { removed = Kestrel::removeField(database, id, field); });
    return removed;
  }

  bool removeObject(const ObjectId &id) override {
    bool removed = false;
    change([&](Database &database) { removed = Kestrel::removeObject(database, id); });
    return removed;
  }

  void replace(const std::vector<StoredObject> &objects) override {
    change([&](Database &database) { replaceObjects(database, objects); });
  }

  std::vector<Detail> details() override {
    std::vector<Detail> details;
    consistently([&] { details = describeTables(session_->file.database()); });
    return details;
  }

  bool current() override { return session_ && session_->file.inPlace(); }

 private:
  void reopen() {
    session_.reset();
    session_ = std::make_unique<Session>(path_, timeout_);
  }

  // Repeats a reading that somebody else's change may have cut in two. Each new attempt needs
  // another change at just that moment, so there is an end.
  template <typename Reading>
  void consistently(const Reading &reading) {
    constexpr int kAttempts = 10;
    withPlace(path_, [&] {
      if (!session_) reopen();
      for (int attempt = 1; attempt < kAttempts; ++attempt) {
        if (isWhole(reading)) return;
        reopen();
      }
      reading();
    });
  }

  // Runs a reading; false when it has to be run again on a file opened anew.
  template <typename Reading>
  bool isWhole(const Reading &reading) {
    try {
      reading();
    } catch (const SqliteError &) {
      if (session_->file.consistent()) throw;
    }
    return session_->file.consistent();
  }

  // The own reader steps aside first: the last connection that closes a file moves the log into it.
  template <typename Change>
  void change(const Change &apply) {
    session_.reset();
    withPlace(path_, [&] {
      const auto database = openForWriting(path_);
      TransactionStatements statements(*database);
      Transaction transaction(statements, Transaction::Kind::kWrite);
      apply(*database);
      transaction.commit();
    });
  }

  std::string path_;
  std::chrono::milliseconds timeout_;
  std::unique_ptr<Session> session_;  // empty: closed for a change, or the last opening failed
};

}  // namespace

std::shared_ptr<Backend> openSqliteBackend(const Configuration &configuration, Access access) {
  const std::string &path = configuration.path;
  if (access == Access::kCreate) withPlace(path, [&] { createStore(path); });
  if (!fileState(path)) return nullptr;
  return std::make_shared<SqliteBackend>(path, configuration.timeout);
}

}  // namespace Kestrel
