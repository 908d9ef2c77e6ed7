// SPDX-License-Identifier: Apache-2.0
// A database is built whole, or the attempt throws and leaves no file behind.
#include "common/build_database.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <filesystem>
#include <string>

#include "temp_folder.h"

namespace Platform {
namespace {

constexpr int kRows = 300;

void fill(Database &database) {
  database.execute("PRAGMA page_size = 1024; PRAGMA journal_mode = WAL");
  database.execute("BEGIN; CREATE TABLE t (x INTEGER PRIMARY KEY, y TEXT)");
  Statement insert(database, "INSERT INTO t (y) VALUES (?)");
  for (int i = 0; i < kRows; ++i) Query(insert, std::string(100, 'y')).finish();
  database.execute("COMMIT");
}

int64_t rowsOf(const std::string &file) {
  Database database(file, Database::Mode::kImmutable, 0);
  Statement statement(database, "SELECT COUNT(*) FROM t");
  Query query(statement);
  return query.step() ? query.integer(0) : -1;
}

class BuildDatabase : public testing::Test {
 protected:
  size_t fileCount() const {
    const std::filesystem::directory_iterator files(folder_.path());
    return static_cast<size_t>(std::distance(begin(files), end(files)));
  }

  const ::Test::TempFolder folder_;
  const std::string file_ = folder_.path() / "new.db";
};

TEST_F(BuildDatabase, TheFileAloneHoldsEverything) {
  buildDatabase(file_, fill);
  EXPECT_EQ(fileCount(), 1U);
  EXPECT_EQ(rowsOf(file_), kRows);
}

TEST_F(BuildDatabase, WhatAKilledProcessLeftIsReplaced) {
  for (const char *ending : {"", "-wal", "-shm", "-journal"}) {
    ::Test::writeFile(file_ + ending, std::string(4096, 'x'));
  }
  buildDatabase(file_, fill);
  EXPECT_EQ(fileCount(), 1U);
  EXPECT_EQ(rowsOf(file_), kRows);
}

TEST_F(BuildDatabase, AFillThatThrowsLeavesNothing) {
  EXPECT_THROW(buildDatabase(file_,
                             [](Database &database) {
                               fill(database);
                               throw std::runtime_error("no");
                             }),
               std::runtime_error);
  EXPECT_EQ(fileCount(), 0U);
}

TEST_F(BuildDatabase, AnUnfinishedTransactionIsAFailure) {
  EXPECT_THROW(buildDatabase(file_,
                             [](Database &database) {
                               fill(database);
                               database.execute("BEGIN; DELETE FROM t");
                             }),
               SqliteError);
  EXPECT_EQ(fileCount(), 0U);
}

// Builds in a process whose files cannot grow beyond a size. Exit status 0: built.
int buildWithin(const std::string &file, rlim_t maxBytes) {
  const pid_t child = ::fork();
  if (child == 0) {
    (void)::signal(SIGXFSZ, SIG_IGN);
    const rlimit limit{maxBytes, maxBytes};
    if (::setrlimit(RLIMIT_FSIZE, &limit) != 0) ::_exit(2);
    try {
      buildDatabase(file, fill);
      ::_exit(0);
    } catch (const SqliteError &) {
      ::_exit(1);
    }
  }
  int status = 0;
  EXPECT_EQ(::waitpid(child, &status, 0), child);
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

TEST_F(BuildDatabase, AWriteThatFailsAnywhereLeavesNothing) {
  constexpr rlim_t kStep = 1500;  // not a multiple of a page
  int failures = 0;
  for (rlim_t maxBytes = 0;; maxBytes += kStep) {
    ASSERT_LT(maxBytes, rlim_t{1} << 20);
    const int status = buildWithin(file_, maxBytes);
    if (status == 0) break;
    ASSERT_EQ(status, 1) << maxBytes;
    ASSERT_EQ(fileCount(), 0U) << maxBytes;
    ++failures;
  }
  EXPECT_GT(failures, 10);
  EXPECT_EQ(rowsOf(file_), kRows);
}

}  // namespace
}  // namespace Platform
