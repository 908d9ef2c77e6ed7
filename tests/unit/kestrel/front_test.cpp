// SPDX-License-Identifier: Apache-2.0
// libkestrelconfig as programs see it: stores, objects, the two reads, and the exceptions.
#include <gmock/gmock.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <cmath>
#include <cstdint>
#include <limits>
#include <new>
#include <thread>
#include <vector>

#include "store_test.h"

namespace Kestrel {
namespace {

using KestrelConfigStore::ConfigStore;
using KestrelConfigStore::ConfigStoreException;
using KestrelConfigStore::InvalidTypeException;
using ::testing::HasSubstr;

class Front : public StoreTest {};

TEST_F(Front, AMissingFileIsNotMade) {
  EXPECT_EQ(store(), nullptr);
  EXPECT_FALSE(std::filesystem::exists(path()));
}

TEST_F(Front, AnUnknownNameSpaceHasNoStore) {
  put("x", int64_t{1});
  EXPECT_EQ(ConfigStore::GetStore("elsewhere"), nullptr);
  EXPECT_EQ(ConfigStore::GetStore(""), nullptr);
}

TEST_F(Front, AMissingObjectIsEmpty) {
  put("x", int64_t{1});
  EXPECT_EQ(store()->GetObject(id("nothing")), nullptr);
  EXPECT_EQ(store()->GetObject({}), nullptr);
}

TEST_F(Front, EachPartOfAnIdDistinguishesObjects) {
  const auto backend = openBackend(Access::kCreate);
  backend->setField({"k", "c", "g", "e"}, "x", int64_t{1});
  for (const ObjectId &other : {ObjectId{"K", "c", "g", "e"}, ObjectId{"k", "C", "g", "e"},
                                ObjectId{"k", "c", "G", "e"}, ObjectId{"k", "c", "g", ""}}) {
    EXPECT_EQ(store()->GetObject(other), nullptr);
  }
  EXPECT_NE(store()->GetObject({"k", "c", "g", "e"}), nullptr);
}

TEST_F(Front, AMissingFieldLeavesTheResultUntouched) {
  put("x", int64_t{1});
  long whole = 42;
  double real = 4.5;
  EXPECT_FALSE(object()->GetValue("y", &whole));
  EXPECT_FALSE(object()->GetValue("y", &real));
  EXPECT_EQ(whole, 42);
  EXPECT_EQ(real, 4.5);
}

TEST_F(Front, AnIntegerIsReadByBothReads) {
  put("x", int64_t{7});
  long whole = 0;
  double real = 0;
  EXPECT_TRUE(object()->GetValue("x", &whole));
  EXPECT_TRUE(object()->GetValue("x", &real));
  EXPECT_EQ(whole, 7);
  EXPECT_EQ(real, 7.0);
}

TEST_F(Front, IntegersKeepAll64Bits) {
  for (const int64_t value : {std::numeric_limits<int64_t>::min(), int64_t{-1}, int64_t{0},
                              (int64_t{1} << 53) + 1, std::numeric_limits<int64_t>::max()}) {
    put("x", value);
    long whole = 0;
    EXPECT_TRUE(object()->GetValue("x", &whole));
    EXPECT_EQ(whole, value);
  }
}

TEST_F(Front, ARealIsReadOnlyByTheRealRead) {
  put("x", 7.0);
  long whole = 42;
  double real = 0;
  EXPECT_THROW(object()->GetValue("x", &whole), InvalidTypeException);
  EXPECT_EQ(whole, 42);
  EXPECT_TRUE(object()->GetValue("x", &real));
  EXPECT_EQ(real, 7.0);
}

TEST_F(Front, RealsComeBackBitForBit) {
  for (const double value : {0.1, -0.0, 5e-324, 1.7976931348623157e308, 1.0 / 3.0,
                             std::numeric_limits<double>::infinity()}) {
    put("x", value);
    double real = 42;
    ASSERT_TRUE(object()->GetValue("x", &real));
    EXPECT_EQ(real, value);
    EXPECT_EQ(std::signbit(real), std::signbit(value));
  }
}

TEST_F(Front, ARealMayBeNotANumber) {
  put("x", std::numeric_limits<double>::quiet_NaN());
  double real = 0;
  EXPECT_TRUE(object()->GetValue("x", &real));
  EXPECT_TRUE(std::isnan(real));
}

TEST_F(Front, TextsAndTruthValuesAreReadByNeitherRead) {
  for (const Value &value : {Value(true), Value(std::string("7")), Value(std::string())}) {
    put("x", value);
    long whole = 0;
    double real = 0;
    EXPECT_THROW(object()->GetValue("x", &whole), InvalidTypeException);
    EXPECT_THROW(object()->GetValue("x", &real), InvalidTypeException);
  }
}

TEST_F(Front, AWrongTypeIsAFailureOfTheStoreAndSaysWhichField) {
  put("size", std::string("big"));
  long whole = 0;
  EXPECT_EQ(failureOf([&] { object()->GetValue("size", &whole); }),
            "field \"size\" is of type text, not an integer");
}

TEST_F(Front, AnObjectWithoutFieldsIsAnObject) {
  put("x", int64_t{1});
  sql("INSERT INTO object (component, \"group\", \"key\") VALUES ('host', 'pools', 'bare')");
  const auto bare = store()->GetObject(id("bare"));
  ASSERT_NE(bare, nullptr);
  long whole = 0;
  EXPECT_FALSE(bare->GetValue("x", &whole));
}

TEST_F(Front, AnObjectStaysAsItWasWhenItWasLookedUp) {
  put("x", int64_t{1});
  const auto before = object();
  put("x", int64_t{2});
  long whole = 0;
  EXPECT_TRUE(before->GetValue("x", &whole));
  EXPECT_EQ(whole, 1);
  EXPECT_TRUE(object()->GetValue("x", &whole));
  EXPECT_EQ(whole, 2);
}

TEST_F(Front, AStoreThatAppearsLaterIsFound) {
  EXPECT_EQ(store(), nullptr);
  put("x", int64_t{1});
  EXPECT_NE(store(), nullptr);
}

TEST_F(Front, AReplacedStoreIsOpenedAgain) {
  put("x", int64_t{1});
  ASSERT_NE(object(), nullptr);
  std::filesystem::rename(path(), file("old.db"));
  std::filesystem::remove(path() + "-wal");
  std::filesystem::remove(path() + "-shm");
  EXPECT_EQ(store(), nullptr);
  put("x", int64_t{2});
  long whole = 0;
  EXPECT_TRUE(object()->GetValue("x", &whole));
  EXPECT_EQ(whole, 2);
}

TEST_F(Front, TheConfigurationIsReadOnceARun) {
  put("x", int64_t{1});
  ASSERT_NE(object(), nullptr);
  configure("path = " + file("other.db") + "\n");
  EXPECT_NE(object(), nullptr);
  configure("nonsense\n");
  EXPECT_NE(object(), nullptr);
}

TEST_F(Front, ABadConfigurationIsBadForTheWholeRun) {
  const std::string good = "path = " + path() + "\n";
  put("x", int64_t{1});
  configure("nonsense\n");
  EXPECT_NE(failureOf([] { store(); }), "");
  configure(good);
  EXPECT_NE(failureOf([] { store(); }), "");
}

TEST_F(Front, ABadConfigurationIsAFailureWithFileAndLine) {
  configure("# one\nstore = nothing\n");
  EXPECT_THAT(failureOf([] { store(); }), HasSubstr("kestrel.conf:2: store: bad value"));
}

TEST_F(Front, AHeldStoreReadsOnAfterAnotherWasOpened) {
  put("x", int64_t{1});
  const auto held = store();
  std::filesystem::rename(path(), file("old.db"));
  EXPECT_EQ(store(), nullptr);
  EXPECT_NE(held->GetObject(id("backup")), nullptr);
}

TEST_F(Front, SeveralThreadsReadAtTheSameTime) {
  put("x", int64_t{1});
  std::atomic<int> found{0};
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i) {
    threads.emplace_back([&found] {
      for (int round = 0; round < 100; ++round) {
        long whole = 0;
        if (object()->GetValue("x", &whole) && whole == 1) ++found;
      }
    });
  }
  for (std::thread &thread : threads) thread.join();
  EXPECT_EQ(found, 400);
}

TEST_F(Front, AChildProcessOpensAStoreOfItsOwn) {
  put("x", int64_t{1});
  ASSERT_NE(object(), nullptr);
  const pid_t child = fork();
  if (child == 0) {
    long whole = 0;
    _exit(object()->GetValue("x", &whole) && whole == 1 ? 0 : 1);
  }
  int status = 0;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_EQ(status, 0);
  EXPECT_NE(object(), nullptr);
}

}  // namespace
}  // namespace Kestrel
