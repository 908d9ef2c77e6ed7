// SPDX-License-Identifier: Apache-2.0
// One run sees one revision, whatever others change meanwhile.
#include <gmock/gmock.h>

#include "etcd_world.h"

namespace Test {
namespace {

using Kestrel::Fields;
using testing::HasSubstr;

class EtcdRun : public ServersFixture {
 protected:
  EtcdRun() : ServersFixture(1) {
    put("c/g/a", R"({"n":1})");
    put("c/g/b", R"({"n":1})");
  }
  const Kestrel::ObjectId a_ = object("c", "g", "a"), b_ = object("c", "g", "b"),
                          c_ = object("c", "g", "c");
  const Fields one_ = {{"n", int64_t{1}}}, two_ = {{"n", int64_t{2}}};
};

TEST_F(EtcdRun, SeesNothingOfAChangeInItsMiddle) {
  const auto run = store();
  EXPECT_EQ(run->read(a_), one_);
  put("c/g/a", R"({"n":2})");
  put("c/g/b", R"({"n":2})");
  put("c/g/c", R"({"n":2})");
  EXPECT_EQ(run->read(b_), one_);
  EXPECT_EQ(run->read(a_), one_);
  EXPECT_EQ(run->read(c_), std::nullopt);
  EXPECT_EQ(run->list({}).size(), 2U);
  EXPECT_EQ(store()->read(b_), two_);
}

TEST_F(EtcdRun, BeginsWithItsFirstAnswerEvenWhenThatFindsNothing) {
  const auto run = store();
  EXPECT_EQ(run->read(c_), std::nullopt);
  put("c/g/c", R"({"n":2})");
  put("c/g/a", R"({"n":2})");
  EXPECT_EQ(run->read(c_), std::nullopt);
  EXPECT_EQ(run->read(a_), one_);
}

TEST_F(EtcdRun, GoesOnFromItsOwnChange) {
  const auto run = store();
  EXPECT_EQ(run->read(a_), one_);
  put("c/g/b", R"({"n":2})");
  EXPECT_EQ(run->read(b_), one_);
  run->setField(a_, "n", int64_t{2});
  EXPECT_EQ(run->read(a_), two_);
  EXPECT_EQ(run->read(b_), two_);
}

TEST_F(EtcdRun, ThatChangedNothingStaysWhereItWas) {
  const auto run = store();
  EXPECT_EQ(run->read(a_), one_);
  put("c/g/b", R"({"n":2})");
  EXPECT_FALSE(run->removeObject(c_));
  EXPECT_FALSE(run->removeField(a_, "none"));
  EXPECT_EQ(run->read(b_), one_);
}

TEST_F(EtcdRun, WhoseRevisionIsCompactedHasNoStoreAnyMoreAndNeverMixesMoments) {
  const auto run = store();
  EXPECT_EQ(run->read(a_), one_);
  put("c/g/a", R"({"n":2})");
  put("c/g/a", R"({"n":2})");
  const std::string json = etcd_.etcdctl({"get", "-w", "json", "c"});
  const size_t at = json.find("\"revision\":") + 11;
  etcd_.etcdctl({"compact", json.substr(at, json.find_first_not_of("0123456789", at) - at)});

  EXPECT_THAT(refusalOf([&] { run->read(b_); }), HasSubstr("forgotten revision"));
  etcd_.member(0).kill();
  EXPECT_THAT(refusalOf([&] { run->read(a_); }), HasSubstr("forgotten revision"));
}

}  // namespace
}  // namespace Test
