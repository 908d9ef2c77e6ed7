// SPDX-License-Identifier: Apache-2.0
// A cluster of three whose members die, stop and come back under a run.
#include <gmock/gmock.h>

#include <algorithm>
#include <chrono>

#include "etcd_world.h"

namespace Test {
namespace {

using Kestrel::Fields;
using std::chrono::milliseconds;
using testing::HasSubstr;

class EtcdCluster : public ServersFixture {
 protected:
  EtcdCluster() : ServersFixture(3) {
    put("c/g/a", R"({"n":1})");
    put("c/g/b", R"({"n":1})");
    for (size_t i = 0; i < 3; ++i) awaitValue(i);
  }

  // A linearizable read through a member returns when the member has caught up.
  void awaitValue(size_t index) {
    auto configuration = etcd_.configuration();
    configuration.endpoints = {etcd_.urls()[index]};
    ASSERT_TRUE(Kestrel::Etcd::openEtcdBackend(configuration)->read(b_));
  }

  std::shared_ptr<Kestrel::Backend> storeWithin(milliseconds timeout) {
    auto configuration = etcd_.configuration();
    configuration.timeout = timeout;
    return Kestrel::Etcd::openEtcdBackend(configuration);
  }

  const Kestrel::ObjectId a_ = object("c", "g", "a"), b_ = object("c", "g", "b");
  const Fields one_ = {{"n", int64_t{1}}}, two_ = {{"n", int64_t{2}}};
};

TEST_F(EtcdCluster, RespondsWithItsFirstMemberKilled) {
  etcd_.member(0).kill();
  EXPECT_EQ(store()->lookUp(a_), one_);
}

TEST_F(EtcdCluster, AStoppedMemberCostsARunLittleMoreThan200Ms) {
  etcd_.member(0).stop();
  awaitValue(1);  // a leader, if the stopped member was it
  const auto run = storeWithin(milliseconds(20000));
  const auto time = timeOf([&] { EXPECT_EQ(run->lookUp(a_), one_); });
  EXPECT_GE(time, milliseconds(200));
  EXPECT_LT(time, milliseconds(1000));
  const auto later = timeOf([&] {
    for (int i = 0; i < 100; ++i) EXPECT_EQ(run->lookUp(b_), one_);
  });
  EXPECT_LT(later, milliseconds(100));
}

TEST_F(EtcdCluster, WithoutAQuorumARunReadsAndSaysHowOldItMayBe) {
  etcd_.member(0).kill();
  etcd_.member(2).kill();
  const auto run = storeWithin(milliseconds(2000));
  const auto time = timeOf([&] { EXPECT_EQ(run->lookUp(a_), one_); });
  EXPECT_LT(time, milliseconds(2000));
  EXPECT_EQ(run->lookUp(b_), one_);
  EXPECT_EQ(run->source().name, "etcd without a quorum");
  EXPECT_THAT(run->source().problem, HasSubstr("no quorum"));
}

TEST_F(EtcdCluster, AReadForPeopleIsNeverOlderThanTheLastChange) {
  etcd_.member(2).stop();
  store()->setField(a_, "n", int64_t{2});
  etcd_.member(2).resume();
  auto configuration = etcd_.configuration();
  std::rotate(configuration.endpoints.begin(), configuration.endpoints.begin() + 2,
              configuration.endpoints.end());
  EXPECT_EQ(Kestrel::Etcd::openEtcdBackend(configuration)->read(a_), two_);
}

TEST_F(EtcdCluster, WithoutAQuorumAReadForPeopleFails) {
  etcd_.member(1).kill();
  etcd_.member(2).kill();
  const auto run = storeWithin(milliseconds(500));
  EXPECT_THAT(refusalOf([&] { run->read(a_); }), HasSubstr("no member responds"));
}

TEST_F(EtcdCluster, WithoutAQuorumRefusesAChangeInTime) {
  etcd_.member(1).kill();
  etcd_.member(2).kill();
  const auto run = storeWithin(milliseconds(500));
  std::string why;
  const auto time = timeOf([&] { why = refusalOf([&] { run->setField(a_, "n", int64_t{2}); }); });
  EXPECT_NE(why, "");
  EXPECT_LT(time, milliseconds(5000));
  EXPECT_EQ(store()->lookUp(a_), one_);
}

TEST_F(EtcdCluster, AllStoppedCostARunOneWaitAndNotOneForEachLookup) {
  const auto run = storeWithin(milliseconds(900));
  for (size_t i = 0; i < 3; ++i) etcd_.member(i).stop();
  const auto time = timeOf([&] {
    for (int i = 0; i < 100; ++i) {
      EXPECT_THAT(refusalOf([&] { run->lookUp(b_); }), HasSubstr("no member responds"));
    }
  });
  EXPECT_GE(time, milliseconds(850));
  EXPECT_LT(time, milliseconds(1700));
  for (size_t i = 0; i < 3; ++i) etcd_.member(i).resume();
  EXPECT_THAT(refusalOf([&] { run->lookUp(b_); }), HasSubstr("not asked again"));
  EXPECT_EQ(store()->lookUp(b_), one_);
}

TEST_F(EtcdCluster, AllKilledAreReportedEachWithItsReason) {
  for (size_t i = 0; i < 3; ++i) etcd_.member(i).kill();
  const std::string why = refusalOf([&] { store()->lookUp(a_); });
  for (const std::string &url : etcd_.urls()) EXPECT_THAT(why, HasSubstr(url + ": "));
}

TEST_F(EtcdCluster, AChangeIsMadeThroughAnyMember) {
  etcd_.member(0).kill();
  store()->setField(a_, "n", int64_t{2});
  EXPECT_EQ(store()->lookUp(a_), two_);
}

TEST_F(EtcdCluster, StatusDescribesEachMember) {
  etcd_.member(0).kill();
  etcd_.member(1).stop();
  const auto health = storeWithin(milliseconds(500))->health();
  ASSERT_GE(health.details.size(), 4U);
  EXPECT_EQ(health.details[0], Kestrel::Detail("prefix", "/kestrel"));
  EXPECT_THAT(health.details[1].second,
              HasSubstr(etcd_.urls()[0] + ": does not respond: Failed to connect"));
  EXPECT_THAT(health.details[2].second,
              HasSubstr(etcd_.urls()[1] + ": does not respond: Operation timed"));
  EXPECT_THAT(health.details[3].second, HasSubstr(etcd_.urls()[2] + ": etcd 3."));
  EXPECT_THAT(health.details[3].second, testing::ContainsRegex("responds in [0-9]+\\.[0-9]+ ms"));
  EXPECT_THAT(health.problem, HasSubstr("no quorum: values may be old"));
}

}  // namespace
}  // namespace Test
