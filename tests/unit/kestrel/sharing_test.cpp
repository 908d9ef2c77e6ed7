// SPDX-License-Identifier: Apache-2.0
// The store between processes: readers beside a writer, readers without rights, and files that
// SQLite itself cannot open where they are.
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <functional>

#include "kestrel/sqlite_file.h"
#include "store_test.h"

namespace Kestrel {
namespace {

using ::testing::HasSubstr;

constexpr uid_t kNobodyId = 65534;

class SharedStore : public StoreTest {
 protected:
  SharedStore() { std::filesystem::permissions(folder_.path(), std::filesystem::perms(0755)); }

  // Runs CLAIM in a process of its own; as the user "nobody" when this one is root.
  static bool holdsForNobody(const std::function<bool()> &claim) {
    const pid_t child = fork();
    if (child == 0) {
      if (geteuid() == 0 && setuid(kNobodyId) != 0) _exit(2);
      bool holds = false;
      try {
        holds = claim();
      } catch (const std::exception &error) {
        fprintf(stderr, "as nobody: %s\n", error.what());
      }
      _exit(holds ? 0 : 1);
    }
    int status = -1;
    return waitpid(child, &status, 0) == child && status == 0;
  }

  static bool readsOne() {
    long whole = 0;
    return object()->GetValue("x", &whole) && whole == 1;
  }

  void removeFilesBeside() const {
    std::filesystem::remove(path() + "-wal");
    std::filesystem::remove(path() + "-shm");
  }
};

TEST_F(SharedStore, AReaderNeverWaitsForAWriter) {
  put("x", int64_t{1});
  Platform::Database writer(path(), Platform::Database::Mode::kReadWrite, 0);
  writer.execute("BEGIN IMMEDIATE; UPDATE field SET value = 2");
  configure("path = " + path() + "\ntimeout-ms = 1\n");
  EXPECT_TRUE(readsOne());
  writer.execute("COMMIT");
  EXPECT_FALSE(readsOne());
}

TEST_F(SharedStore, AWriterNeverWaitsForAReader) {
  put("x", int64_t{1});
  Platform::Database reader(path(), Platform::Database::Mode::kReadOnly, 0);
  reader.execute("BEGIN; SELECT * FROM field");
  put("x", int64_t{2});
  EXPECT_FALSE(readsOne());
}

TEST_F(SharedStore, TwoWritersLoseNeitherField) {
  put("x", int64_t{1});
  constexpr int kWrites = 50;
  const auto writeAll = [](const std::string &name) {
    for (int i = 0; i < kWrites; ++i) put(name + std::to_string(i), int64_t{i});
    return true;
  };
  const pid_t child = fork();
  if (child == 0) _exit(writeAll("child") ? 0 : 1);
  writeAll("parent");
  int status = -1;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_EQ(status, 0);
  EXPECT_EQ(openBackend(Access::kRead)->read(id("backup"))->size(), 1U + 2 * kWrites);
}

TEST_F(SharedStore, ManyProcessesMakeOneStore) {
  constexpr int kProcesses = 8;
  for (int i = 0; i < kProcesses; ++i) {
    if (fork() == 0) {
      const std::string why = failureOf([i] { put(std::to_string(i), int64_t{i}); });
      if (!why.empty()) fprintf(stderr, "%s\n", why.c_str());
      _exit(why.empty() ? 0 : 1);
    }
  }
  for (int i = 0; i < kProcesses; ++i) {
    int status = -1;
    ASSERT_GT(wait(&status), 0);
    EXPECT_EQ(status, 0);
  }
  EXPECT_EQ(openBackend(Access::kRead)->read(id("backup"))->size(), size_t{kProcesses});
}

TEST_F(SharedStore, AUserWithoutRightsReadsTheHostsStore) {
  if (geteuid() != 0) GTEST_SKIP() << "not root: no user has fewer rights";
  put("x", int64_t{1});
  EXPECT_TRUE(holdsForNobody(readsOne));
}

TEST_F(SharedStore, AUserWithoutRightsReadsBesideAWriter) {
  if (geteuid() != 0) GTEST_SKIP() << "not root: no user has fewer rights";
  put("x", int64_t{2});
  Platform::Database writer(path(), Platform::Database::Mode::kReadWrite, 0);
  writer.execute("UPDATE field SET value = 1; BEGIN IMMEDIATE; UPDATE field SET value = 3");
  EXPECT_TRUE(holdsForNobody(readsOne));
  writer.execute("COMMIT");
}

TEST_F(SharedStore, AUserWithoutRightsReadsAStoreWithoutItsLog) {
  if (geteuid() != 0) GTEST_SKIP() << "not root: no user has fewer rights";
  put("x", int64_t{1});
  removeFilesBeside();
  EXPECT_TRUE(holdsForNobody(readsOne));
  EXPECT_FALSE(std::filesystem::exists(path() + "-wal"));
}

TEST_F(SharedStore, AStoreWithoutItsLogIsReadAgainAfterAChange) {
  if (geteuid() != 0) GTEST_SKIP() << "not root: no user has fewer rights";
  put("x", int64_t{2});
  removeFilesBeside();
  int ends[2];
  ASSERT_EQ(pipe(ends), 0);
  int back[2];
  ASSERT_EQ(pipe(back), 0);
  const pid_t child = fork();
  if (child == 0) {
    char byte = 0;
    if (setuid(kNobodyId) != 0) _exit(2);
    const auto held = store();
    long whole = 0;
    const bool before = held->GetObject(id("backup"))->GetValue("x", &whole) && whole == 2;
    if (write(back[1], "r", 1) != 1 || read(ends[0], &byte, 1) != 1) _exit(3);
    const bool after = held->GetObject(id("backup"))->GetValue("x", &whole) && whole == 1;
    _exit(before && after ? 0 : 1);
  }
  char byte = 0;
  ASSERT_EQ(read(back[0], &byte, 1), 1);
  put("x", int64_t{1});
  ASSERT_EQ(write(ends[1], "w", 1), 1);
  int status = -1;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_EQ(status, 0);
}

TEST_F(SharedStore, AnUnreadableFileIsAFailureNotAMissingStore) {
  put("x", int64_t{1});
  ASSERT_EQ(chmod(path().c_str(), 0), 0);
  EXPECT_TRUE(holdsForNobody([] {
    return failureOf([] { store(); }).find("cannot be read: Permission denied") !=
           std::string::npos;
  }));
}

TEST_F(SharedStore, AnUnreachableFolderIsAFailureNotAMissingStore) {
  std::filesystem::create_directory(file("closed"));
  configure("path = " + file("closed/store.db") + "\n");
  ASSERT_EQ(chmod(file("closed").c_str(), 0), 0);
  EXPECT_TRUE(holdsForNobody(
      [] { return failureOf([] { store(); }).find("Permission denied") != std::string::npos; }));
  ASSERT_EQ(chmod(file("closed").c_str(), 0700), 0);
}

TEST_F(SharedStore, AUserWithoutRightsChangesNothing) {
  if (geteuid() != 0) GTEST_SKIP() << "not root: no user has fewer rights";
  put("x", int64_t{1});
  EXPECT_TRUE(holdsForNobody([] { return !failureOf([] { put("x", int64_t{2}); }).empty(); }));
  EXPECT_TRUE(readsOne());
}

TEST_F(SharedStore, AStoreIsNotMadeWhereTheUserMayNotWrite) {
  if (geteuid() != 0) GTEST_SKIP() << "not root: no user has fewer rights";
  EXPECT_TRUE(holdsForNobody([] {
    return failureOf([] { put("x", int64_t{2}); }).find("cannot be made") != std::string::npos;
  }));
  configure("path = " + file("new/store.db") + "\n");
  EXPECT_TRUE(holdsForNobody([] {
    return failureOf([] { put("x", int64_t{2}); }).find("cannot be made") != std::string::npos;
  }));
}

TEST_F(SharedStore, TheFailureOfALockedFileNamesTheLock) {
  put("x", int64_t{1});
  sql("PRAGMA journal_mode = DELETE");
  Platform::Database other(path(), Platform::Database::Mode::kReadWrite, 0);
  other.execute("BEGIN EXCLUSIVE");
  configure("path = " + path() + "\ntimeout-ms = 1\n");
  EXPECT_THAT(failureOf([] { store(); }), HasSubstr("another process has locked it"));
}

}  // namespace
}  // namespace Kestrel
