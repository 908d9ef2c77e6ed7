// SPDX-License-Identifier: Apache-2.0
// The SQLite file: files that are not a store or a damaged one, what the tables themselves refuse,
// and the changes.
#include <gmock/gmock.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <fstream>

#include "common/sqlite.h"
#include "kestrel/object_names.h"
#include "store_test.h"

namespace Kestrel {
namespace {

using ::testing::HasSubstr;
using ::testing::StartsWith;

class SqliteStore : public StoreTest {
 protected:
  // The failure of opening and reading the store.
  std::string failure() const {
    const std::string text = failureOf([] { openBackend(Access::kRead)->read(id("backup")); });
    EXPECT_THAT(text, StartsWith(path() + ": "));
    return text;
  }

  static std::string keys(const Selection &selection) {
    std::string text;
    for (const StoredObject &object : openBackend(Access::kRead)->list(selection).objects) {
      text += describe(object.id) + " ";
    }
    return text;
  }
};

TEST_F(SqliteStore, AnEmptyFileIsNotAStore) {
  ::Test::writeFile(path(), "");
  EXPECT_THAT(failure(), HasSubstr("not a configuration store"));
}

TEST_F(SqliteStore, AnotherProgramsDatabaseIsNotAStore) {
  sql("CREATE TABLE t (x); PRAGMA user_version = 1");
  EXPECT_THAT(failure(), HasSubstr("not a configuration store"));
}

TEST_F(SqliteStore, AFileThatIsNotADatabaseIsDamaged) {
  ::Test::writeFile(path(), std::string(8192, 'x'));
  EXPECT_THAT(failure(), HasSubstr("the file is damaged"));
}

TEST_F(SqliteStore, ATruncatedFileIsDamaged) {
  put("x", int64_t{1});
  std::filesystem::resize_file(path(), std::filesystem::file_size(path()) - 5000);
  EXPECT_THAT(failure(), HasSubstr("the file is damaged"));
}

TEST_F(SqliteStore, AnOverwrittenPageIsDamaged) {
  put("x", int64_t{1});
  std::fstream raw(path(), std::ios::in | std::ios::out | std::ios::binary);
  raw.seekp(4096);
  raw << std::string(std::filesystem::file_size(path()) - 4096, 'x');
  raw.close();
  EXPECT_THAT(failure(), HasSubstr("the file is damaged"));
}

TEST_F(SqliteStore, AnotherSchemaVersionIsLeftAlone) {
  put("x", int64_t{1});
  sql("PRAGMA user_version = 2");
  EXPECT_THAT(failure(), HasSubstr("schema version 2"));
  EXPECT_THAT(failureOf([] { put("y", int64_t{1}); }), HasSubstr("schema version 2"));
}

TEST_F(SqliteStore, AFolderInItsPlaceIsAFailure) {
  std::filesystem::create_directory(path());
  EXPECT_THAT(failure(), HasSubstr("not a regular file"));
}

TEST_F(SqliteStore, APathThroughAFileIsAFailure) {
  ::Test::writeFile(file("plain"), "");
  configure("path = " + file("plain") + "/store.db\n");
  EXPECT_THAT(failureOf([] { openBackend(Access::kRead); }), HasSubstr("Not a directory"));
}

TEST_F(SqliteStore, ItsFolderIsMadeWithTheStore) {
  configure("path = " + file("a/b/store.db") + "\n");
  put("x", int64_t{1});
  EXPECT_TRUE(std::filesystem::exists(file("a/b/store.db")));
  EXPECT_EQ(openBackend(Access::kRead)->list({}).objects.size(), 1U);
}

TEST_F(SqliteStore, MakingItLeavesNothingBeside) {
  put("x", int64_t{1});
  for (const auto &entry : std::filesystem::directory_iterator(folder_.path())) {
    const std::string name = entry.path().filename().string();
    EXPECT_TRUE(name == "kestrel.conf" || name.find("store.db") == 0) << name;
    EXPECT_EQ(name.find(".new-"), std::string::npos) << name;
  }
}

// A limit of the file size fails the writes as a full disk does, at each size in turn.
TEST_F(SqliteStore, AFirstUseThatFailsLeavesNothingBehind) {
  for (rlim_t limit = 0; limit <= 65536; limit += 1024) {
    const pid_t child = fork();
    if (child == 0) {
      const rlimit size{limit, limit};
      signal(SIGXFSZ, SIG_IGN);
      if (setrlimit(RLIMIT_FSIZE, &size) != 0) _exit(2);
      _exit(failureOf([] { openBackend(Access::kCreate); }).empty() ? 0 : 1);
    }
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    ASSERT_TRUE(status == 0 || WEXITSTATUS(status) == 1) << status;
    for (const auto &entry : std::filesystem::directory_iterator(folder_.path())) {
      ASSERT_EQ(entry.path().string().find(".new-"), std::string::npos) << entry.path();
    }
    put("x", int64_t{1});
    ASSERT_EQ(openBackend(Access::kRead)->read(id("backup")), (Fields{{"x", int64_t{1}}})) << limit;
    for (const char *ending : {"", "-wal", "-shm"}) std::filesystem::remove(path() + ending);
  }
}

TEST_F(SqliteStore, TheWholeStoreIsInOneFileAfterAChange) {
  put("x", int64_t{1});
  put("y", std::string("text"));
  std::filesystem::copy_file(path(), file("copy.db"));
  configure("path = " + file("copy.db") + "\n");
  EXPECT_EQ(openBackend(Access::kRead)->read(id("backup"))->size(), 2U);
}

TEST_F(SqliteStore, APathMayHoldWhatAUriMayNot) {
  configure("path = " + file("50%20?a=b#c.db") + "\n");
  put("x", int64_t{1});
  EXPECT_NE(openBackend(Access::kRead)->read(id("backup")), std::nullopt);
  EXPECT_TRUE(std::filesystem::exists(file("50%20?a=b#c.db")));
}

TEST_F(SqliteStore, ItsTablesRefuseAValueOfAnotherType) {
  put("x", int64_t{1});
  for (const char *row :
       {"'integer', 'text'", "'integer', 1.5", "'real', 1", "'real', 'x'", "'boolean', 2",
        "'boolean', 'true'", "'text', 1", "'text', x'00'", "'date', 'now'", "'integer', NULL"}) {
    const std::string text =
        "INSERT INTO field SELECT id, 'new', " + std::string(row) + " FROM object";
    EXPECT_THROW(sql(text.c_str()), Platform::SqliteError) << row;
  }
  EXPECT_THROW(sql("PRAGMA foreign_keys = ON; INSERT INTO field VALUES (77, 'n', 'integer', 1)"),
               Platform::SqliteError);
  EXPECT_THROW(sql("INSERT INTO object (component, \"group\", \"key\")"
                   " VALUES ('host', 'pools', 'backup')"),
               Platform::SqliteError);
}

TEST_F(SqliteStore, AValueThatGotPastTheChecksIsDamage) {
  put("x", int64_t{1});
  sql("PRAGMA ignore_check_constraints = ON; UPDATE field SET value = 'seven'");
  EXPECT_THAT(failure(), HasSubstr("field \"x\" does not hold a value of type integer"));
}

TEST_F(SqliteStore, ADamagedObjectDoesNotHideTheOthers) {
  put("x", int64_t{1});
  openBackend(Access::kCreate)->setField(id("other"), "y", int64_t{2});
  sql("PRAGMA ignore_check_constraints = ON; UPDATE field SET value = 'seven' WHERE name = 'x'");
  const Listing listing = openBackend(Access::kRead)->list({});
  ASSERT_EQ(listing.objects.size(), 1U);
  EXPECT_EQ(listing.objects[0].id.key, "other");
  ASSERT_EQ(listing.damaged.size(), 1U);
  EXPECT_EQ(listing.damaged[0].name, "host/pools/backup");
}

TEST_F(SqliteStore, AFieldChangesItsTypeWithItsValue) {
  put("x", int64_t{1});
  put("x", std::string("one"));
  EXPECT_EQ(openBackend(Access::kRead)->read(id("backup")), (Fields{{"x", std::string("one")}}));
}

TEST_F(SqliteStore, SettingAFieldLeavesTheOthersAlone) {
  put("x", int64_t{1});
  put("y", true);
  EXPECT_EQ(openBackend(Access::kRead)->read(id("backup")),
            (Fields{{"x", int64_t{1}}, {"y", true}}));
}

TEST_F(SqliteStore, TextsKeepEveryByte) {
  for (const std::string &text :
       {std::string(), std::string("\"'`;--\n\t\\"), std::string("a\0b", 3),
        std::string("gr\xc3\xbcn \xf0\x9f\x90\xa6")}) {
    put("x", text);
    EXPECT_EQ(openBackend(Access::kRead)->read(id("backup")), (Fields{{"x", text}}));
  }
}

TEST_F(SqliteStore, AnObjectGoesWithItsLastField) {
  put("x", int64_t{1});
  put("y", int64_t{2});
  const auto backend = openBackend(Access::kChange);
  EXPECT_TRUE(backend->removeField(id("backup"), "x"));
  EXPECT_FALSE(backend->removeField(id("backup"), "x"));
  EXPECT_NE(backend->read(id("backup")), std::nullopt);
  EXPECT_TRUE(backend->removeField(id("backup"), "y"));
  EXPECT_EQ(backend->read(id("backup")), std::nullopt);
  EXPECT_FALSE(backend->removeField(id("backup"), "y"));
}

TEST_F(SqliteStore, AnObjectIsRemovedWithItsFields) {
  put("x", int64_t{1});
  const auto backend = openBackend(Access::kChange);
  EXPECT_TRUE(backend->removeObject(id("backup")));
  EXPECT_FALSE(backend->removeObject(id("backup")));
  put("y", int64_t{2});
  EXPECT_EQ(backend->read(id("backup")), (Fields{{"y", int64_t{2}}}));
}

TEST_F(SqliteStore, ChangingDoesNotMakeAStore) {
  EXPECT_EQ(openBackend(Access::kChange), nullptr);
  EXPECT_FALSE(std::filesystem::exists(path()));
}

TEST_F(SqliteStore, ObjectsAreListedInByteOrderAndBySelection) {
  const auto backend = openBackend(Access::kCreate);
  for (const ObjectId &each :
       {ObjectId{"b", "z", "g", ""}, ObjectId{"a", "z", "g", "2"}, ObjectId{"a", "z", "g", ""},
        ObjectId{"a", "", "", ""}, ObjectId{"a", "z", "G", ""}, ObjectId{"a", "Z", "h", ""}}) {
    backend->setField(each, "x", int64_t{1});
  }
  EXPECT_EQ(keys({}), "//a Z/h/a z/G/a z/g/a z/g/a/2 z/g/b ");
  EXPECT_EQ(keys({"z", {}}), "z/G/a z/g/a z/g/a/2 z/g/b ");
  EXPECT_EQ(keys({"z", "G"}), "z/G/a ");
  EXPECT_EQ(keys({"", {}}), "//a ");
  EXPECT_EQ(keys({"none", {}}), "");
}

TEST_F(SqliteStore, AReplacementTakesTheWholeObjectAndLeavesOthers) {
  put("x", int64_t{1});
  const auto backend = openBackend(Access::kCreate);
  backend->setField(id("other"), "x", int64_t{1});
  backend->replace({{id("backup"), {{"y", 0.5}}}, {id("new"), {}}});
  EXPECT_EQ(backend->read(id("backup")), (Fields{{"y", 0.5}}));
  EXPECT_EQ(backend->read(id("other")), (Fields{{"x", int64_t{1}}}));
  EXPECT_EQ(backend->read(id("new")), Fields{});
}

TEST_F(SqliteStore, AReplacementThatFailsHalfwayChangesNothing) {
  put("x", int64_t{1});
  sql("CREATE TRIGGER refuse BEFORE INSERT ON field WHEN NEW.name = 'bad'"
      " BEGIN SELECT RAISE(ABORT, 'refused'); END");
  const auto backend = openBackend(Access::kChange);
  EXPECT_THAT(failureOf([&] {
                backend->replace({{id("backup"), {{"y", true}}}, {id("new"), {{"bad", true}}}});
              }),
              HasSubstr("refused"));
  EXPECT_EQ(backend->read(id("backup")), (Fields{{"x", int64_t{1}}}));
  EXPECT_EQ(backend->read(id("new")), std::nullopt);
}

TEST_F(SqliteStore, AnInspectionCountsAndChecks) {
  put("x", int64_t{1});
  put("y", int64_t{1});
  const Report report = inspect();
  EXPECT_EQ(report.condition, Condition::kUsable);
  EXPECT_EQ(report.problem, "");
  std::string text;
  for (const auto &[label, value] : report.details) {
    if (label != "responds in") text += label + "=" + value + " ";
  }
  EXPECT_EQ(text, "configuration=" + file("kestrel.conf") + " store=sqlite location=" + path() +
                      " schema=version 1 objects=1 fields=2 ");
}

TEST_F(SqliteStore, AnInspectionDistinguishesAMissingStoreFromABadOne) {
  EXPECT_EQ(inspect().condition, Condition::kMissing);
  ::Test::writeFile(path(),
                    "no database, but long enough to be read as the head of one, is it not?"
                    " A hundred bytes make one.");
  EXPECT_EQ(inspect().condition, Condition::kUnusable);
  configure("nonsense\n");
  const Report report = inspect();
  EXPECT_EQ(report.condition, Condition::kUnusable);
  EXPECT_THAT(report.problem, HasSubstr("kestrel.conf:1:"));
}

TEST_F(SqliteStore, AnInspectionOfAnotherEngineNamesItsAddresses) {
  configure("store = etcd\nendpoints = http://127.0.0.1:1, http://127.0.0.1:2\n");
  const Report report = inspect();
  EXPECT_EQ(report.condition, Condition::kUnusable);
  EXPECT_THAT(report.details,
              ::testing::Contains(Detail("location", "http://127.0.0.1:1, http://127.0.0.1:2")));
  EXPECT_NE(report.problem, "");
}

TEST_F(SqliteStore, AReplacedStoreIsNoLongerCurrent) {
  put("x", int64_t{1});
  const auto backend = openBackend(Access::kRead);
  EXPECT_TRUE(backend->current());
  put("x", int64_t{2});
  EXPECT_TRUE(backend->current());
  std::filesystem::rename(path(), file("old.db"));
  EXPECT_FALSE(backend->current());
}

TEST(ObjectNames, AreUtf8WithoutNul) {
  EXPECT_NO_THROW(checkId({"", "", "", ""}));
  EXPECT_NO_THROW(checkId({"a/b", "%", " ", "\xc3\xbc"}));
  EXPECT_THROW(checkId({"\xff", "", "", ""}), ValueError);
  EXPECT_THROW(checkId({"", "\xff", "", ""}), ValueError);
  EXPECT_THROW(checkId({"", "", "\xff", ""}), ValueError);
  EXPECT_THROW(checkId({"", "", "", std::string(1, '\0')}), ValueError);
  EXPECT_NO_THROW(checkFieldName("x"));
  EXPECT_THROW(checkFieldName(""), ValueError);
  EXPECT_THROW(checkFieldName("\xff"), ValueError);
}

}  // namespace
}  // namespace Kestrel
