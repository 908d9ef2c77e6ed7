// SPDX-License-Identifier: Apache-2.0
#include "common/sqlite.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <chrono>
#include <optional>
#include <thread>

#include "sqlite_memory_limit.h"
#include "temp_folder.h"

namespace Platform {
namespace {

class Sqlite : public testing::Test {
 protected:
  Sqlite() { database_.execute("CREATE TABLE t (i INTEGER UNIQUE, r REAL, s TEXT)"); }

  std::string path() const { return folder_.path() / "x.db"; }
  int64_t rows() {
    Statement count(database_, "SELECT COUNT(*) FROM t");
    Query query(count);
    return query.step() ? query.integer(0) : -1;
  }

  const ::Test::TempFolder folder_;
  Database database_{path(), Database::Mode::kCreate, 1000};
};

TEST_F(Sqlite, ValuesComeBackAsTheyWereBound) {
  Statement insert(database_, "INSERT INTO t VALUES (?, ?, ?)");
  const std::string bytes("a\0\xff", 3);
  Query(insert, int64_t{INT64_MIN}, 0.5, bytes).finish();
  EXPECT_EQ(database_.changedRows(), 1);
  EXPECT_EQ(database_.lastInsertId(), 1);
  Statement select(database_, "SELECT i, r, s, NULL FROM t");
  Query query(select);
  ASSERT_TRUE(query.step());
  EXPECT_EQ(query.integer(0), INT64_MIN);
  EXPECT_EQ(query.real(1), 0.5);
  EXPECT_EQ(query.text(2), bytes);
  EXPECT_TRUE(query.isNull(3));
  EXPECT_EQ(query.text(3), "");
  EXPECT_EQ(query.type(2), SQLITE_TEXT);
  EXPECT_FALSE(query.step());
}

TEST_F(Sqlite, EmptyTextsAndNullAreTwoThings) {
  Statement insert(database_, "INSERT INTO t (s, r) VALUES (?, ?)");
  Query(insert, std::string_view(), nullptr).finish();
  Query(insert, "", nullptr).finish();
  Statement select(database_, "SELECT COUNT(*) FROM t WHERE s = '' AND r IS NULL");
  Query query(select);
  ASSERT_TRUE(query.step());
  EXPECT_EQ(query.integer(0), 2);
}

TEST_F(Sqlite, AStatementRunsAgainAfterAFailure) {
  Statement insert(database_, "INSERT INTO t (i) VALUES (?)");
  Query(insert, 1).finish();
  try {
    Query(insert, 1).finish();
    FAIL();
  } catch (const SqliteError &error) {
    EXPECT_EQ(error.code, SQLITE_CONSTRAINT);
    EXPECT_EQ(error.extendedCode, SQLITE_CONSTRAINT_UNIQUE);
    EXPECT_STREQ(error.what(), "UNIQUE constraint failed: t.i");
  }
  Query(insert, 2).finish();
  EXPECT_EQ(rows(), 2);
}

TEST_F(Sqlite, ABadTextFailsWhenItIsRun) {
  Statement bad(database_, "SELEKT");
  EXPECT_THROW(Query{bad}, SqliteError);
  EXPECT_THROW(database_.execute("SELEKT"), SqliteError);
}

TEST_F(Sqlite, AnArgumentTooManyFails) {
  Statement insert(database_, "INSERT INTO t (i) VALUES (?)");
  EXPECT_THROW((Query{insert, 1, 2}), SqliteError);
}

TEST_F(Sqlite, ATransactionThatIsNotCommittedLeavesNothing) {
  TransactionStatements statements(database_);
  {
    const Transaction transaction(statements, Transaction::Kind::kWrite);
    database_.execute("INSERT INTO t (i) VALUES (1)");
  }
  EXPECT_EQ(rows(), 0);
}

TEST_F(Sqlite, ACommittedTransactionStays) {
  TransactionStatements statements(database_);
  {
    Transaction transaction(statements, Transaction::Kind::kWrite);
    database_.execute("INSERT INTO t (i) VALUES (1)");
    transaction.commit();
  }
  EXPECT_EQ(rows(), 1);
}

TEST_F(Sqlite, ATransactionThatSqliteEndedItselfIsLeftAlone) {
  TransactionStatements statements(database_);
  {
    const Transaction transaction(statements, Transaction::Kind::kRead);
    database_.execute("ROLLBACK");
  }
  EXPECT_EQ(rows(), 0);
}

TEST_F(Sqlite, ATransactionEndsWithoutAnyMemory) {
  TransactionStatements statements(database_);
  std::optional<Transaction> transaction;
  transaction.emplace(statements, Transaction::Kind::kWrite);
  database_.execute("INSERT INTO t VALUES (1, 0.5, 'x')");
  {
    const ::Test::SqliteMemoryLimit none(0);
    transaction.reset();
  }
  EXPECT_EQ(rows(), 0);
  Transaction(statements, Transaction::Kind::kWrite).commit();
}

TEST_F(Sqlite, AReaderOfAMissingFileFailsAndMakesNone) {
  const std::string missing = folder_.path() / "none.db";
  try {
    const Database none(missing, Database::Mode::kReadOnly, 0);
    FAIL();
  } catch (const SqliteError &error) {
    EXPECT_EQ(error.code, SQLITE_CANTOPEN);
  }
  EXPECT_THROW(Database(missing, Database::Mode::kReadWrite, 0), SqliteError);
  EXPECT_NE(::access(missing.c_str(), F_OK), 0);
}

TEST_F(Sqlite, AnImmutableFileIsReadWhateverItsNameHolds) {
  const std::string odd = folder_.path() / "50% a?b#c.db";
  { Database(odd, Database::Mode::kCreate, 0).execute("CREATE TABLE only (i)"); }
  Database database(odd, Database::Mode::kImmutable, 0);
  Statement select(database, "SELECT COUNT(*) FROM only");
  Query query(select);
  EXPECT_TRUE(query.step());
}

TEST_F(Sqlite, ALockedFileIsBusyAfterTheWaitThatWasAsked) {
  TransactionStatements statements(database_);
  const Transaction transaction(statements, Transaction::Kind::kWrite);
  Database other(path(), Database::Mode::kReadWrite, 20);
  try {
    other.execute("BEGIN IMMEDIATE");
    FAIL();
  } catch (const SqliteError &error) {
    EXPECT_EQ(error.code, SQLITE_BUSY);
  }
}

TEST_F(Sqlite, AWriterWaitsForTheOneBeforeIt) {
  TransactionStatements statements(database_);
  auto transaction = std::make_unique<Transaction>(statements, Transaction::Kind::kWrite);
  std::thread waiter([this] {
    Database other(path(), Database::Mode::kReadWrite, 20000);
    other.execute("INSERT INTO t (i) VALUES (7)");
  });
  std::this_thread::yield();
  transaction->commit();
  waiter.join();
  EXPECT_EQ(rows(), 1);
}

}  // namespace
}  // namespace Platform
