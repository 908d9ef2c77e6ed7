// SPDX-License-Identifier: Apache-2.0
// The last known good values: when they are written, when they are used, and what makes them
// unusable.
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <thread>

#include "etcd_world.h"
#include "fake_server.h"
#include "kestrel/etcd/base64.h"
#include "kestrel/etcd/last_known_good.h"

namespace Test {
namespace {

using Kestrel::Fields;
using Kestrel::Etcd::LastKnownGood;
using Kestrel::Etcd::StoredValues;
using std::chrono::milliseconds;
using std::chrono::system_clock;
using testing::HasSubstr;

const std::string kKey = "/kestrel/global/c/g/a";
const std::string kValue = R"({"n":1})";

class LastGood : public testing::Test {
 protected:
  LastGood() {
    configuration_.engine = Kestrel::Engine::kEtcd;
    configuration_.endpoints = {"http://" + freePlace()};
    configuration_.snapshot = file();
    configuration_.timeout = milliseconds(500);
  }

  std::string file() const { return folder_.path() / "deep" / "snapshot"; }

  static StoredValues values(system_clock::time_point time = system_clock::now()) {
    StoredValues values;
    values.cluster = "17";
    values.revision = 41;
    values.time = time;
    values.covered = {"", "c/g/"};
    values.values = {{kKey, kValue}, {"/kestrel/global/c/g/empty", ""}};
    return values;
  }
  void write(const StoredValues &values) const {
    EXPECT_EQ(LastKnownGood(configuration_).write(values), "");
  }
  // Why the file cannot be used; "": it can.
  std::string problem() const {
    StoredValues read;
    read.revision = 7;
    std::string why;
    if (LastKnownGood(configuration_).read(&read, &why)) return "";
    EXPECT_EQ(read.revision, 7) << "a failure leaves the values as they were";
    EXPECT_NE(why, "");
    return why;
  }
  std::shared_ptr<Kestrel::Backend> run() const {
    return Kestrel::Etcd::openEtcdBackend(configuration_);
  }

  TempFolder folder_;
  Kestrel::Configuration configuration_;
  const Kestrel::ObjectId a_ = object("c", "g", "a");
  const Fields one_ = {{"n", int64_t{1}}};
};

TEST_F(LastGood, WhatIsWrittenIsRead) {
  const StoredValues written = values();
  write(written);
  StoredValues read;
  std::string why;
  ASSERT_TRUE(LastKnownGood(configuration_).read(&read, &why)) << why;
  EXPECT_EQ(read.cluster, written.cluster);
  EXPECT_EQ(read.revision, written.revision);
  EXPECT_EQ(read.covered, written.covered);
  EXPECT_EQ(read.values, written.values);
  EXPECT_LT(written.time - read.time, std::chrono::seconds(1));
}

TEST_F(LastGood, OnlyItsOwnerMayReadIt) {
  write(values());
  struct stat info {};
  ASSERT_EQ(stat(file().c_str(), &info), 0);
  EXPECT_EQ(info.st_mode & 0777U, 0600U);
  for (const mode_t mode : std::initializer_list<mode_t>{0644, 0620, 0602}) {
    ASSERT_EQ(chmod(file().c_str(), mode), 0);
    EXPECT_THAT(problem(), HasSubstr("other users have access"));
  }
}

TEST_F(LastGood, AnotherUsersFileOrALinkIsNotUsed) {
  write(values());
  const std::string real = folder_.path() / "real";
  ASSERT_EQ(rename(file().c_str(), real.c_str()), 0);
  ASSERT_EQ(symlink(real.c_str(), file().c_str()), 0);
  EXPECT_THAT(problem(), HasSubstr("not a regular file"));
  ASSERT_EQ(unlink(file().c_str()), 0);
  ASSERT_EQ(rename(real.c_str(), file().c_str()), 0);
  if (geteuid() != 0) GTEST_SKIP() << "not root: no file of another user can be made";
  ASSERT_EQ(chown(file().c_str(), 65534, 65534), 0);
  EXPECT_THAT(problem(), HasSubstr("another user owns it"));
}

TEST_F(LastGood, IsUsedUpToItsAgeAndNotFromTheFuture) {
  write(values(system_clock::now() - std::chrono::hours(6 * 24)));
  EXPECT_EQ(problem(), "");
  configuration_.maxAge = std::chrono::hours(5 * 24);
  EXPECT_THAT(problem(), HasSubstr("older than max-age"));
  configuration_.snapshot = folder_.path() / "future";
  write(values(system_clock::now() + std::chrono::hours(1)));
  EXPECT_THAT(problem(), HasSubstr("from the future"));
}

TEST_F(LastGood, IsNotUsedWithAnotherConfiguration) {
  write(values());
  const auto good = configuration_;
  configuration_.prefixes = {"/kestrel/host/h", "/kestrel"};
  EXPECT_THAT(problem(), HasSubstr("another configuration"));
  configuration_ = good;
  configuration_.user = "u";
  EXPECT_THAT(problem(), HasSubstr("another configuration"));
  configuration_ = good;
  configuration_.endpoints.push_back("http://other:1");
  EXPECT_THAT(problem(), HasSubstr("another configuration"));
}

TEST_F(LastGood, EveryCutAndEveryChangedByteIsNoticed) {
  write(values());
  const std::string text = readFile(file());
  for (size_t length = 0; length < text.size(); ++length) {
    writeFile(file(), text.substr(0, length));
    ASSERT_NE(problem(), "") << length;
  }
  for (size_t at = 0; at < text.size(); ++at) {
    std::string changed = text;
    changed[at] = changed[at] == 'x' ? 'y' : 'x';
    writeFile(file(), changed);
    ASSERT_NE(problem(), "") << at;
  }
}

TEST_F(LastGood, EqualValuesAreNotWrittenAgainWithinTheHour) {
  write(values(system_clock::now() - std::chrono::minutes(30)));
  struct stat before {
  }, after{};
  ASSERT_EQ(stat(file().c_str(), &before), 0);
  write(values());
  ASSERT_EQ(stat(file().c_str(), &after), 0);
  EXPECT_EQ(before.st_ino, after.st_ino);
  StoredValues changed = values();
  changed.values[kKey] = "{}";
  write(changed);
  ASSERT_EQ(stat(file().c_str(), &after), 0);
  EXPECT_NE(before.st_ino, after.st_ino);
}

TEST_F(LastGood, AFileThatCannotBeWrittenIsAReasonAndLeavesNothing) {
  writeFile(folder_.path() / "deep", "a file where a folder should be");
  EXPECT_NE(LastKnownGood(configuration_).write(values()), "");
  EXPECT_EQ(problem(), "Not a directory");
}

TEST_F(LastGood, ServesARunWhenNoMemberResponds) {
  write(values());
  const auto store = run();
  EXPECT_EQ(store->lookUp(a_), one_);
  EXPECT_EQ(store->lookUp(object("c", "g", "none")), std::nullopt);
  EXPECT_EQ(store->source().name, "last known good");
  EXPECT_EQ(store->source().revision, 41);
  EXPECT_THAT(store->source().problem, HasSubstr("no member responds"));
}

TEST_F(LastGood, ServesOnlyThePartsThatItCovers) {
  StoredValues some = values();
  some.covered = {"c/g/"};
  write(some);
  const auto store = run();
  EXPECT_EQ(store->lookUp(a_), one_);
  EXPECT_THAT(refusalOf([&] { store->lookUp(object("d", "g", "a")); }),
              HasSubstr("no member responds"));
  EXPECT_EQ(store->lookUp(a_), one_);
}

TEST_F(LastGood, ServesARunOfSilentMembersAfterOneTimeout) {
  FakeServer *self = nullptr;
  FakeServer silent([&](const FakeRequest &) {
    self->wait(milliseconds(60000));
    return std::string();
  });
  self = &silent;
  configuration_.endpoints = {silent.url()};
  write(values());
  const auto store = run();
  const auto time = timeOf([&] {
    for (int i = 0; i < 100; ++i) EXPECT_EQ(store->lookUp(a_), one_);
  });
  EXPECT_GE(time, milliseconds(450));
  EXPECT_LT(time, milliseconds(1500));
}

TEST_F(LastGood, IsWrittenByARunAndUsedByTheNext) {
  auto server =
      std::make_unique<FakeServer>([](const FakeRequest &) { return rangeOf(kKey, kValue, "9"); });
  configuration_.endpoints = {server->url()};
  EXPECT_EQ(run()->lookUp(a_), one_);
  server.reset();
  const auto store = run();
  EXPECT_EQ(store->lookUp(a_), one_);
  EXPECT_EQ(store->source().revision, 9);
}

TEST_F(LastGood, IsNotUsedAfterARefusal) {
  const char *refusals[] = {R"({"error":"permission denied","code":7})",
                            R"({"error":"etcdserver: user name is empty","code":3})",
                            R"({"error":"etcdserver: invalid auth token","code":16})"};
  for (const char *refusal : refusals) {
    const FakeServer server([&](const FakeRequest &) { return httpResponse(400, refusal); });
    configuration_.endpoints = {server.url()};
    configuration_.snapshot = folder_.path() / ("snapshot" + std::to_string(server.connections()));
    write(values());
    EXPECT_NE(refusalOf([&] { run()->lookUp(a_); }), "") << refusal;
  }
}

// Values of another moment are never mixed into a run that has read some.
TEST_F(LastGood, IsNotUsedByARunThatHasReadTheStore) {
  int requests = 0;
  const FakeServer server([&](const FakeRequest &request) {
    ++requests;
    if (requests == 1) return httpResponse(403, R"({"error":"permission denied","code":7})");
    const bool group =
        request.body.find(Kestrel::Etcd::toBase64("/kestrel/global/c/g/")) != std::string::npos;
    return group ? rangeOf(kKey, kValue) : std::string();
  });
  configuration_.endpoints = {server.url()};
  StoredValues stored = values();
  stored.values["/kestrel/global/d/g/a"] = kValue;
  write(stored);
  const auto store = run();
  EXPECT_EQ(store->lookUp(a_), one_);
  EXPECT_NE(refusalOf([&] { store->lookUp(object("d", "g", "a")); }), "");
}

// Several threads with their own stores, as a program has them.
TEST_F(LastGood, RunsAtTheSameTimeReplaceItWhole) {
  const FakeServer server([](const FakeRequest &) { return rangeOf(kKey, kValue, "9"); });
  configuration_.endpoints = {server.url()};
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i) {
    threads.emplace_back([&] {
      for (int round = 0; round < 20; ++round) EXPECT_EQ(run()->lookUp(a_), one_);
    });
  }
  for (std::thread &thread : threads) thread.join();
  EXPECT_EQ(problem(), "");
}

}  // namespace
}  // namespace Test
