// SPDX-License-Identifier: Apache-2.0
// Thin: every function here is one call of SQLite and the check of its result.
#include "common/sqlite.h"

#include <chrono>
#include <new>
#include <thread>

namespace Platform {
namespace {

// The URI of a path: the one way to tell SQLite that a file is immutable.
std::string immutableUri(const std::string &path) {
  std::string uri = "file:";
  for (const char c : path) {
    switch (c) {
      case '%':
        uri += "%25";
        break;
      case '?':
        uri += "%3f";
        break;
      case '#':
        uri += "%23";
        break;
      default:
        uri += c;
    }
  }
  return uri + "?immutable=1";
}

}  // namespace

// SQLite's own waits grow to tenths of a second, while other processes need microseconds.
int Database::waitForOthers(void *wait, int round) {
  constexpr int kShortRounds = 20;
  constexpr std::chrono::microseconds kShort(50), kLong(1000);
  Wait &current = *static_cast<Wait *>(wait);
  const auto now = std::chrono::steady_clock::now();
  if (round == 0) current.began = now;
  if (now - current.began >= current.limit) return 0;
  std::this_thread::sleep_for(round < kShortRounds ? kShort : kLong);
  return 1;
}

Database::Database(const std::string &path, Mode mode, int busyMs)
    : wait_(std::make_unique<Wait>(Wait{std::chrono::milliseconds(busyMs), {}})) {
  int flags = SQLITE_OPEN_NOMUTEX;
  switch (mode) {
    case Mode::kReadOnly:
      flags |= SQLITE_OPEN_READONLY;
      break;
    case Mode::kReadWrite:
      flags |= SQLITE_OPEN_READWRITE;
      break;
    case Mode::kCreate:
      flags |= SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE;
      break;
    case Mode::kImmutable:
      flags |= SQLITE_OPEN_READONLY | SQLITE_OPEN_URI;
      break;
  }
  const std::string name = mode == Mode::kImmutable ? immutableUri(path) : path;
  sqlite3 *handle = nullptr;
  const int result = sqliteLibrary().open_v2(name.c_str(), &handle, flags, nullptr);
  handle_.reset(handle);  // must be closed even after a failure
  if (result != SQLITE_OK) fail(result);
  sqliteLibrary().extended_result_codes(handle, 1);
  sqliteLibrary().busy_handler(handle, waitForOthers, wait_.get());
}

void Database::execute(const char *sql) {
  const int result = sqliteLibrary().exec(handle_.get(), sql, nullptr, nullptr, nullptr);
  if (result != SQLITE_OK) fail(result);
}

void Database::fail(int resultCode) const {
  if ((resultCode & 0xff) == SQLITE_NOMEM || resultCode == SQLITE_IOERR_NOMEM) {
    throw std::bad_alloc();
  }
  throw SqliteError(resultCode, handle_ ? sqliteLibrary().errmsg(handle_.get())
                                        : sqliteLibrary().errstr(resultCode));
}

void Statement::prepare() {
  sqlite3_stmt *handle = nullptr;
  const int result =
      sqliteLibrary().prepare_v3(database_.get(), sql_.data(), static_cast<int>(sql_.size()),
                                 SQLITE_PREPARE_PERSISTENT, &handle, nullptr);
  if (result != SQLITE_OK) database_.fail(result);
  handle_.reset(handle);
}

// A reset repeats the error of the last step, which has been thrown already.
Query::~Query() {
  (void)sqliteLibrary().reset(statement_);
}

bool Query::step() {
  const int result = sqliteLibrary().step(statement_);
  if (result == SQLITE_ROW) return true;
  if (result == SQLITE_DONE) return false;
  database_.fail(result);
}

std::string Query::text(int column) const {
  // The text first: asking for it may convert the value, and the size is that of the result.
  const unsigned char *bytes = sqliteLibrary().column_text(statement_, column);
  const int size = sqliteLibrary().column_bytes(statement_, column);
  if (bytes == nullptr) return {};
  return {reinterpret_cast<const char *>(bytes), static_cast<size_t>(size)};
}

void Query::bind(int position, int64_t value) {
  check(sqliteLibrary().bind_int64(statement_, position, value));
}

void Query::bind(int position, double value) {
  check(sqliteLibrary().bind_double(statement_, position, value));
}

void Query::bind(int position, std::string_view text) {
  // A null pointer would bind NULL instead of an empty text.
  const char *bytes = text.data() == nullptr ? "" : text.data();
  check(sqliteLibrary().bind_text64(statement_, position, bytes, text.size(), SQLITE_STATIC,
                                    SQLITE_UTF8));
}

void Query::bind(int position, std::nullptr_t) {
  check(sqliteLibrary().bind_null(statement_, position));
}

void Query::check(int resultCode) const {
  if (resultCode != SQLITE_OK) database_.fail(resultCode);
}

Transaction::Transaction(TransactionStatements &statements, Kind kind) : statements_(statements) {
  (void)statements.rollback.get();
  (void)statements.commit.get();
  Query(kind == Kind::kRead ? statements.read : statements.write).finish();
}

Transaction::~Transaction() {
  if (!open_) return;
  // Some failures have rolled back already.
  if (sqliteLibrary().get_autocommit(statements_.rollback.database().get()) != 0) return;
  (void)sqliteLibrary().step(statements_.rollback.get());
  (void)sqliteLibrary().reset(statements_.rollback.get());
}

void Transaction::commit() {
  Query(statements_.commit).finish();
  open_ = false;
}

}  // namespace Platform
