// SPDX-License-Identifier: Apache-2.0
// Each operation is one transaction. A reader keeps its file open and its one statement prepared; a
// writer opens the file for one change.
#include "kestrel/sqlite_backend.h"

#include "common/sqlite.h"
#include "kestrel/errors.h"
#include "kestrel/sqlite_file.h"
#include "kestrel/sqlite_tables.h"
#include "kestrel/text.h"

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
      return "another process has locked it; wait for it to end, or end it";
    case SQLITE_CORRUPT:
    case SQLITE_NOTADB:
      return std::string("the file is damaged: ") + error.what() +
             " (repair it with the sqlite3 shell's .recover, or remove it and import an export)";
    default:
      return error.what();
  }
}

// Runs one operation, and turns SQLite's errors into the store's.
template <typename Operation>
void withPath(const std::string &path, const Operation &operation) {
  try {
    operation();
  } catch (const SqliteError &error) {
    throw storeError(path, reason(error));
  }
}

// One opening of the file. The statement is released before the database.
struct Session {
  Session(const std::string &path, std::chrono::milliseconds timeout)
      : file(path, timeout), readObject(file.database(), kReadObject) {}

  ReadableFile file;
  Statement readObject;
};

class SqliteBackend : public Backend {
 public:
  SqliteBackend(std::string path, std::chrono::milliseconds timeout)
      : path_(std::move(path)), timeout_(timeout) {
    withPath(path_, [&] { reopen(); });
  }

  std::optional<Fields> read(const ObjectId &id) override {
    std::optional<Fields> fields;
    consistently([&] { fields = readObject(session_->readObject, id); });
    return fields;
  }

  std::vector<LayerFields> layers(const ObjectId &id) override {
    auto fields = read(id);
    if (!fields) return {};
    return {{path_, std::move(*fields)}};
  }

  RunSource source() const override {
    RunSource source;
    source.name = "sqlite";
    return source;
  }

  Listing list(const Selection &selection) override {
    Listing listing;
    consistently([&] { listing = selectObjects(session_->file.database(), selection); });
    return listing;
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

  bool move(const ObjectId &, const std::string &, const std::string &) override {
    throw storeError(path_, "an SQLite store has no layers");
  }

  Health health() override {
    Health health;
    consistently([&] { health.details = describeTables(session_->file.database()); });
    const auto start = std::chrono::steady_clock::now();
    (void)read(ObjectId{});
    const auto time = std::chrono::steady_clock::now() - start;
    health.details.emplace_back("responds in", inMilliseconds(time));
    return health;
  }

  bool current() override { return session_ && session_->file.inPlace(); }

 private:
  void reopen() {
    session_.reset();
    session_ = std::make_unique<Session>(path_, timeout_);
  }

  // Repeats a read that another process's change may have torn. Each further attempt needs another
  // change at just that moment, so the number of attempts is bounded.
  template <typename Reading>
  void consistently(const Reading &reading) {
    constexpr int kAttempts = 10;
    withPath(path_, [&] {
      if (!session_) reopen();
      for (int attempt = 1; attempt < kAttempts; ++attempt) {
        if (isWhole(reading)) return;
        reopen();
      }
      reading();
    });
  }

  // Runs a read; false when it has to be repeated on the file opened again.
  template <typename Reading>
  bool isWhole(const Reading &reading) {
    try {
      reading();
    } catch (const SqliteError &) {
      if (session_->file.consistent()) throw;
    }
    return session_->file.consistent();
  }

  // Closes the own reader first: the last connection that closes a file moves the log into it.
  template <typename Change>
  void change(const Change &apply) {
    session_.reset();
    withPath(path_, [&] {
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
  if (access == Access::kCreate) withPath(path, [&] { createStore(path); });
  if (!fileState(path)) return nullptr;
  return std::make_shared<SqliteBackend>(path, configuration.timeout);
}

}  // namespace Kestrel
