// SPDX-License-Identifier: Apache-2.0
// Users and passwords on a real server.
#include <gmock/gmock.h>
#include <sys/stat.h>

#include "etcd_world.h"

namespace Test {
namespace {

using Kestrel::Fields;
using testing::HasSubstr;
using testing::Not;

constexpr const char *kPassword = "long secret \"\xc3\xa9\\";

class EtcdUsers : public ServersFixture {
 protected:
  EtcdUsers() : ServersFixture(1) {
    put("c/g/a", R"({"n":1})");
    put("c/g/b", R"({"n":1})");
    put("d/g/a", R"({"n":1})");
    writePassword(kPassword);
    user({"add", "root:" + std::string("r")});
    user({"grant-role", "root", "root"});
    etcd_.etcdctl({"role", "add", "hosts"});
    etcd_.etcdctl(
        {"role", "grant-permission", "--prefix=true", "hosts", "read", "/kestrel/global/c/"});
    user({"add", "host:" + std::string(kPassword)});
    user({"grant-role", "host", "hosts"});
    etcd_.etcdctl({"auth", "enable"});
  }

  void user(std::vector<std::string> words) const {
    words.insert(words.begin(), "user");
    etcd_.etcdctl(words);
  }
  std::string asRoot(std::vector<std::string> words) const {
    words.insert(words.begin(), "--user=root:r");
    return etcd_.etcdctl(words);
  }
  void writePassword(const std::string &text, mode_t mode = 0600) const {
    const auto path = folder_.path() / "password";
    writeFile(path, text + "\n");
    chmod(path.c_str(), mode);
  }
  std::shared_ptr<Kestrel::Backend> storeOf(const std::string &name) const {
    auto configuration = etcd_.configuration();
    configuration.user = name;
    configuration.passwordFile = folder_.path() / "password";
    return Kestrel::Etcd::openEtcdBackend(configuration);
  }

  const Kestrel::ObjectId a_ = object("c", "g", "a"), b_ = object("c", "g", "b"),
                          others_ = object("d", "g", "a");
  const Fields one_ = {{"n", int64_t{1}}};
};

TEST_F(EtcdUsers, TheRightPasswordReadsWhatTheRoleAllows) {
  const auto run = storeOf("host");
  EXPECT_EQ(run->lookUp(a_), one_);
  EXPECT_EQ(run->lookUp(b_), one_);
}

TEST_F(EtcdUsers, WhatTheRoleDoesNotAllowIsRefusedAndTheRestIsStillRead) {
  const auto run = storeOf("host");
  EXPECT_THAT(refusalOf([&] { run->lookUp(others_); }), HasSubstr("permission denied"));
  EXPECT_THAT(refusalOf([&] { run->list({}); }), HasSubstr("permission denied"));
  EXPECT_THAT(refusalOf([&] { run->setField(a_, "n", true); }), HasSubstr("permission denied"));
  EXPECT_THAT(refusalOf([&] { run->removeObject(a_); }), HasSubstr("permission denied"));
  EXPECT_EQ(run->lookUp(a_), one_);
}

TEST_F(EtcdUsers, ARoleForOneKeyIsEnoughForThatKey) {
  asRoot({"role", "add", "key"});
  asRoot({"role", "grant-permission", "key", "read", "/kestrel/global/d/g/a"});
  asRoot({"user", "add", "narrow:" + std::string(kPassword)});
  asRoot({"user", "grant-role", "narrow", "key"});
  const auto run = storeOf("narrow");
  EXPECT_EQ(run->lookUp(others_), one_);
  EXPECT_THAT(refusalOf([&] { run->lookUp(a_); }), HasSubstr("permission denied"));
  EXPECT_EQ(run->lookUp(others_), one_);
}

TEST_F(EtcdUsers, ARoleForOneComponentIsAUsableStore) {
  const auto health = storeOf("host")->health();
  EXPECT_EQ(health.problem, "");
  EXPECT_THAT(health.details.back().second, HasSubstr("not for the whole prefix"));
}

TEST_F(EtcdUsers, AWrongPasswordIsRefusedOnceAndNeverShown) {
  writePassword("another secret");
  const auto run = storeOf("host");
  const std::string why = refusalOf([&] { run->lookUp(a_); });
  EXPECT_THAT(why, HasSubstr("user \"host\": etcdserver: authentication failed"));
  EXPECT_THAT(why, Not(HasSubstr("secret")));
  writePassword(kPassword);
  EXPECT_THAT(refusalOf([&] { run->lookUp(a_); }), HasSubstr("not asked again"));
}

TEST_F(EtcdUsers, AnUnknownUserIsRefused) {
  EXPECT_THAT(refusalOf([&] { storeOf("unknown")->lookUp(a_); }),
              HasSubstr("authentication failed"));
}

TEST_F(EtcdUsers, WithoutAUserTheRefusalSaysThatOneIsRequired) {
  const std::string why = refusalOf([&] { store()->lookUp(a_); });
  EXPECT_THAT(why, HasSubstr("user name is empty"));
  EXPECT_THAT(why, HasSubstr("the server requires a \"user\""));
}

TEST_F(EtcdUsers, ATokenThatTheServerForgotIsRenewed) {
  const auto run = storeOf("host");
  EXPECT_EQ(run->lookUp(a_), one_);
  etcd_.member(0).kill();
  etcd_.member(0).start();
  etcd_.awaitReady(0);
  EXPECT_EQ(run->read(b_), one_);
}

TEST_F(EtcdUsers, ATokenOfAnOldPasswordIsRenewedWithTheNewOne) {
  const auto run = storeOf("host");
  EXPECT_EQ(run->lookUp(a_), one_);
  asRoot({"user", "delete", "host"});
  asRoot({"user", "add", "host:new"});
  asRoot({"user", "grant-role", "host", "hosts"});
  writePassword("new");
  EXPECT_EQ(run->read(b_), one_);
}

TEST_F(EtcdUsers, ATokenThatCannotBeRenewedEndsTheRunsStore) {
  const auto run = storeOf("host");
  EXPECT_EQ(run->lookUp(a_), one_);
  asRoot({"user", "delete", "host"});
  EXPECT_THAT(refusalOf([&] { run->read(b_); }), HasSubstr("authentication failed"));
  EXPECT_THAT(refusalOf([&] { run->read(b_); }), HasSubstr("not asked again"));
}

TEST_F(EtcdUsers, APasswordFileThatOthersMayReadIsNotUsed) {
  for (const mode_t mode : std::initializer_list<mode_t>{0644, 0640, 0604, 0620}) {
    writePassword(kPassword, mode);
    EXPECT_THAT(refusalOf([&] { storeOf("host")->lookUp(a_); }),
                HasSubstr("password: the password file: others than its owner have access"));
  }
}

TEST_F(EtcdUsers, AServerWithoutUsersIsReadWithoutAToken) {
  asRoot({"auth", "disable"});
  const auto run = storeOf("host");
  EXPECT_EQ(run->lookUp(a_), one_);
  EXPECT_EQ(run->lookUp(others_), one_);
}

TEST_F(EtcdUsers, AuthenticationThatIsEnabledDuringARunIsUsed) {
  asRoot({"auth", "disable"});
  const auto run = storeOf("host");
  EXPECT_EQ(run->lookUp(a_), one_);
  etcd_.etcdctl({"auth", "enable"});
  EXPECT_EQ(run->read(b_), one_);
  EXPECT_THAT(refusalOf([&] { run->read(others_); }), HasSubstr("permission denied"));
}

}  // namespace
}  // namespace Test
