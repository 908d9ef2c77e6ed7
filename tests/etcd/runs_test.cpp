// SPDX-License-Identifier: Apache-2.0
// One run sees one revision, whatever changes meanwhile, and reads it with as few requests as the
// user's role and the size of the store allow.
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
  // Removes all history before the present revision.
  void compact() const {
    const std::string json = etcd_.etcdctl({"get", "-w", "json", "c"});
    const size_t at = json.find("\"revision\":") + 11;
    etcd_.etcdctl({"compact", json.substr(at, json.find_first_not_of("0123456789", at) - at)});
  }
  std::shared_ptr<Kestrel::Backend> storeOf(const std::vector<std::string> &prefixes) const {
    auto configuration = etcd_.configuration();
    configuration.prefixes = prefixes;
    return Kestrel::Etcd::openEtcdBackend(configuration);
  }
  // More keys than a run reads at once.
  void fillOtherGroup() const {
    for (int from = 0; from < 10100; from += 100) {
      std::vector<Kestrel::StoredObject> objects;
      for (int i = from; i < from + 100; ++i) {
        objects.push_back({object("c", "other", std::to_string(i)), {{"n", int64_t{1}}}});
      }
      store()->replace(objects);
    }
  }

  const Kestrel::ObjectId a_ = object("c", "g", "a"), b_ = object("c", "g", "b"),
                          c_ = object("c", "g", "c");
  const Fields one_ = {{"n", int64_t{1}}}, two_ = {{"n", int64_t{2}}};
};

TEST_F(EtcdRun, SeesNothingOfLaterChanges) {
  const auto run = store();
  EXPECT_EQ(run->lookUp(a_), one_);
  put("c/g/a", R"({"n":2})");
  put("c/g/b", R"({"n":2})");
  put("c/g/c", R"({"n":2})");
  EXPECT_EQ(run->lookUp(b_), one_);
  EXPECT_EQ(run->lookUp(a_), one_);
  EXPECT_EQ(run->lookUp(c_), std::nullopt);
  EXPECT_EQ(store()->lookUp(b_), two_);
}

TEST_F(EtcdRun, BeginsWithItsFirstLookupAlsoOfAMissingObject) {
  const auto run = store();
  EXPECT_EQ(run->lookUp(c_), std::nullopt);
  put("c/g/c", R"({"n":2})");
  put("c/g/a", R"({"n":2})");
  EXPECT_EQ(run->lookUp(c_), std::nullopt);
  EXPECT_EQ(run->lookUp(a_), one_);
}

TEST_F(EtcdRun, SeesItsOwnChange) {
  const auto run = store();
  EXPECT_EQ(run->lookUp(a_), one_);
  put("c/g/b", R"({"n":2})");
  EXPECT_EQ(run->lookUp(b_), one_);
  run->setField(a_, "n", int64_t{2});
  EXPECT_EQ(run->lookUp(a_), two_);
  EXPECT_EQ(run->lookUp(b_), two_);
}

TEST_F(EtcdRun, KeepsItsRevisionWhenItChangedNothing) {
  const auto run = store();
  EXPECT_EQ(run->lookUp(a_), one_);
  put("c/g/b", R"({"n":2})");
  EXPECT_FALSE(run->removeObject(c_));
  EXPECT_FALSE(run->removeField(a_, "none"));
  EXPECT_EQ(run->lookUp(b_), one_);
}

TEST_F(EtcdRun, NeedsNoServerAfterItsFirstLookup) {
  const auto run = store();
  EXPECT_EQ(run->lookUp(a_), one_);
  put("c/g/a", R"({"n":2})");
  put("c/g/a", R"({"n":2})");
  compact();
  etcd_.member(0).kill();
  EXPECT_EQ(run->lookUp(b_), one_);
  EXPECT_EQ(run->lookUp(c_), std::nullopt);
}

TEST_F(EtcdRun, ReadsALargeStoreByComponentAndGroup) {
  fillOtherGroup();
  const auto run = store();
  EXPECT_EQ(run->lookUp(a_), one_);
  put("c/g/b", R"({"n":2})");
  put("d/g/a", R"({"n":2})");
  EXPECT_EQ(run->lookUp(b_), one_);
  EXPECT_EQ(run->lookUp(object("d", "g", "a")), std::nullopt);  // another group, the same revision
  EXPECT_EQ(run->lookUp(object("c", "other", "7")), one_);      // too large even as a group
}

TEST_F(EtcdRun, EndsWhenItsRevisionIsCompactedAndNeverMixesMoments) {
  fillOtherGroup();
  const auto run = store();
  EXPECT_EQ(run->lookUp(a_), one_);
  put("c/g/a", R"({"n":2})");
  put("d/g/a", R"({"n":2})");
  compact();
  EXPECT_THAT(refusalOf([&] { run->lookUp(object("d", "g", "a")); }),
              HasSubstr("no longer has revision"));
  EXPECT_THAT(refusalOf([&] { run->lookUp(object("e", "g", "a")); }),
              HasSubstr("no longer has revision"));
  EXPECT_EQ(run->lookUp(b_), one_);
}

TEST_F(EtcdRun, TakesEachFieldFromTheFirstLayerThatHasIt) {
  etcd_.etcdctl({"put", "/kestrel/host/h1/global/c/g/a"}, R"({"m":7})");
  etcd_.etcdctl({"put", "/kestrel/canary/x/global/c/g/a"}, R"({"m":8,"k":8})");
  const auto run = storeOf({"/kestrel/host/h1", "/kestrel/canary/x", "/kestrel"});
  const Fields merged = {{"k", int64_t{8}}, {"m", int64_t{7}}, {"n", int64_t{1}}};
  EXPECT_EQ(run->lookUp(a_), merged);
  EXPECT_EQ(run->read(a_), merged);
  EXPECT_EQ(run->lookUp(b_), one_);
  EXPECT_EQ(run->lookUp(c_), std::nullopt);
  EXPECT_EQ(storeOf({"/kestrel"})->lookUp(a_), one_);
}

TEST_F(EtcdRun, SeesAllLayersAtOneRevision) {
  const auto run = storeOf({"/kestrel/host/h1", "/kestrel"});
  EXPECT_EQ(run->lookUp(a_), one_);
  etcd_.etcdctl({"put", "/kestrel/host/h1/global/c/g/b"}, R"({"n":2})");
  EXPECT_EQ(run->lookUp(b_), one_);
}

TEST_F(EtcdRun, ReportsItsSourceAndRevision) {
  const auto run = store();
  EXPECT_EQ(run->source().name, "none");
  EXPECT_EQ(run->lookUp(a_), one_);
  EXPECT_EQ(run->source().name, "etcd");
  EXPECT_EQ(run->source().revision, 3);
  EXPECT_EQ(run->source().problem, "");
}

}  // namespace
}  // namespace Test
