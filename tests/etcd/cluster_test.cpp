// SPDX-License-Identifier: Apache-2.0
// A cluster of three whose members die, stop and come back under a run.
#include <gmock/gmock.h>

#include <chrono>
#include <thread>

#include "etcd_world.h"

namespace Test {
namespace {

using Kestrel::Fields;
using std::chrono::milliseconds;
using testing::HasSubstr;

constexpr milliseconds kMoment{10};

class EtcdCluster : public ServersFixture {
 protected:
  EtcdCluster() : ServersFixture(3) {
    put("c/g/a", R"({"n":1})");
    put("c/g/b", R"({"n":1})");
    for (size_t i = 0; i < 3; ++i) awaitValue(i);
  }

  // Serializable reads may be a moment behind; what the tests begin with must be everywhere.
  void awaitValue(size_t index) {
    auto configuration = etcd_.configuration();
    configuration.endpoints = {etcd_.urls()[index]};
    for (int i = 0; i < 1000; ++i) {
      if (Kestrel::Etcd::openEtcdBackend(configuration)->read(b_)) return;
    }
    FAIL() << "member " << index << " does not follow";
  }

  std::shared_ptr<Kestrel::Backend> storeWithin(milliseconds timeout) {
    auto configuration = etcd_.configuration();
    configuration.timeout = timeout;
    return Kestrel::Etcd::openEtcdBackend(configuration);
  }

  const Kestrel::ObjectId a_ = object("c", "g", "a"), b_ = object("c", "g", "b");
  const Fields one_ = {{"n", int64_t{1}}}, two_ = {{"n", int64_t{2}}};
};

TEST_F(EtcdCluster, AnswersWithItsFirstMemberKilled) {
  etcd_.member(0).kill();
  EXPECT_EQ(store()->read(a_), one_);
}

TEST_F(EtcdCluster, GoesOnWhenTheMemberThatAnsweredIsKilledAndStaysAtTheSameRevision) {
  const auto run = store();
  EXPECT_EQ(run->read(a_), one_);
  put("c/g/b", R"({"n":2})");
  etcd_.member(0).kill();
  EXPECT_EQ(run->read(b_), one_);
  etcd_.member(1).kill();
  EXPECT_EQ(run->read(b_), one_);
}

TEST_F(EtcdCluster, AStoppedMemberCostsItsPartOfOneLookupAndIsNotAskedAgain) {
  etcd_.member(0).stop();
  const auto run = storeWithin(milliseconds(1500));
  const auto first = timeOf([&] { EXPECT_EQ(run->read(a_), one_); });
  EXPECT_GE(first, milliseconds(500));
  EXPECT_LT(first, milliseconds(1500));
  const auto later = timeOf([&] {
    for (int i = 0; i < 20; ++i) EXPECT_EQ(run->read(b_), one_);
  });
  EXPECT_LT(later, milliseconds(500));
}

TEST_F(EtcdCluster, AMemberThatStopsInTheMiddleOfARunIsPassedOver) {
  const auto run = storeWithin(milliseconds(1500));
  EXPECT_EQ(run->read(a_), one_);
  etcd_.member(0).stop();
  EXPECT_EQ(run->read(b_), one_);
}

TEST_F(EtcdCluster, WithoutAQuorumStillAnswersLookups) {
  etcd_.member(0).kill();
  etcd_.member(2).kill();
  const auto run = store();
  EXPECT_EQ(run->read(a_), one_);
  EXPECT_EQ(run->read(b_), one_);
  EXPECT_EQ(run->list({}).size(), 2U);
}

TEST_F(EtcdCluster, WithoutAQuorumRefusesAChangeInTime) {
  etcd_.member(1).kill();
  etcd_.member(2).kill();
  const auto run = storeWithin(milliseconds(500));
  std::string why;
  const auto time = timeOf([&] { why = refusalOf([&] { run->setField(a_, "n", int64_t{2}); }); });
  EXPECT_NE(why, "");
  EXPECT_LT(time, milliseconds(5000));
  EXPECT_EQ(store()->read(a_), one_);
}

TEST_F(EtcdCluster, AllStoppedCostARunOneWaitAndNotOneForEachLookup) {
  const auto run = storeWithin(milliseconds(900));
  EXPECT_EQ(run->read(a_), one_);
  for (size_t i = 0; i < 3; ++i) etcd_.member(i).stop();
  const auto time = timeOf([&] {
    for (int i = 0; i < 100; ++i) {
      EXPECT_THAT(refusalOf([&] { run->read(b_); }), HasSubstr("no member answers"));
    }
  });
  EXPECT_GE(time, milliseconds(850));
  EXPECT_LT(time, milliseconds(1700));
  for (size_t i = 0; i < 3; ++i) etcd_.member(i).resume();
  EXPECT_THAT(refusalOf([&] { run->read(b_); }), HasSubstr("not asked again"));
  EXPECT_EQ(store()->read(b_), one_);
}

TEST_F(EtcdCluster, AllKilledAreToldEachWithItsReason) {
  for (size_t i = 0; i < 3; ++i) etcd_.member(i).kill();
  const std::string why = refusalOf([&] { store()->read(a_); });
  for (const std::string &url : etcd_.urls()) EXPECT_THAT(why, HasSubstr(url + ": "));
}

TEST_F(EtcdCluster, AChangeIsMadeThroughAnyMember) {
  etcd_.member(0).kill();
  store()->setField(a_, "n", int64_t{2});
  // The member that answers may be another one than the one that made the change.
  for (int i = 0; i < 1000 && store()->read(a_) != two_; ++i) std::this_thread::sleep_for(kMoment);
  EXPECT_EQ(store()->read(a_), two_);
}

TEST_F(EtcdCluster, StatusTellsOfEachMemberWhetherItAnswers) {
  etcd_.member(0).kill();
  etcd_.member(1).stop();
  const auto details = storeWithin(milliseconds(500))->details();
  ASSERT_EQ(details.size(), 4U);
  EXPECT_EQ(details[0], Kestrel::Detail("prefix", "/kestrel"));
  EXPECT_THAT(details[1].second,
              HasSubstr(etcd_.urls()[0] + ": does not answer: Failed to connect"));
  EXPECT_THAT(details[2].second, HasSubstr(etcd_.urls()[1] + ": does not answer: Operation timed"));
  EXPECT_THAT(details[3].second, HasSubstr(etcd_.urls()[2] + ": etcd 3."));
  EXPECT_THAT(details[3].second, testing::ContainsRegex("answers in [0-9]+\\.[0-9]+ ms"));
}

}  // namespace
}  // namespace Test
