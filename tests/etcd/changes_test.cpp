// SPDX-License-Identifier: Apache-2.0
// Changes and listings on a real server: what they leave alone, what they refuse whole, and that
// writers at the same time lose nothing.
#include <gmock/gmock.h>

#include <thread>

#include "etcd_world.h"

namespace Test {
namespace {

using Kestrel::Fields;
using Kestrel::ObjectId;
using Kestrel::Selection;
using Kestrel::StoredObject;
using testing::HasSubstr;

class EtcdChanges : public ServersFixture {
 protected:
  EtcdChanges() : ServersFixture(1) {}

  static std::vector<StoredObject> objects(int count, const Kestrel::Value &value = int64_t{1}) {
    std::vector<StoredObject> result;
    for (int i = 0; i < count; ++i) {
      result.push_back({object("host", "pools", std::to_string(10000 + i)), {{"n", value}}});
    }
    return result;
  }
  std::string revision() const {
    const std::string json = etcd_.etcdctl({"get", "-w", "json", "none"});
    return json.substr(json.find("\"revision\""), 20);
  }

  const ObjectId id_ = object("host", "pools", "backup");
};

TEST_F(EtcdChanges, SettingAFieldLeavesTheOthersAsTheyAre) {
  put("host/pools/backup", R"({"a":7.0,"b":"x"})");
  store()->setField(id_, "c", int64_t{3});
  store()->setField(id_, "b", true);
  EXPECT_EQ(store()->read(id_), (Fields{{"a", 7.0}, {"b", true}, {"c", int64_t{3}}}));
}

TEST_F(EtcdChanges, AnObjectGoesWithItsLastField) {
  put("host/pools/backup", R"({"a":1,"b":2})");
  EXPECT_TRUE(store()->removeField(id_, "a"));
  EXPECT_EQ(store()->read(id_), (Fields{{"b", int64_t{2}}}));
  EXPECT_TRUE(store()->removeField(id_, "b"));
  EXPECT_EQ(store()->read(id_), std::nullopt);
}

TEST_F(EtcdChanges, RemovingWhatIsMissingChangesNothing) {
  put("host/pools/backup", R"({"a":1})");
  const std::string before = revision();
  EXPECT_FALSE(store()->removeField(id_, "b"));
  EXPECT_FALSE(store()->removeField(object("host", "pools", "other"), "a"));
  EXPECT_FALSE(store()->removeObject(object("host", "pools", "other")));
  EXPECT_EQ(revision(), before);
}

TEST_F(EtcdChanges, RemovingAnObjectLeavesItsNeighbours) {
  for (const char *key : {"host/pools/a", "host/pools/ab", "host/pools/a/x"}) put(key, "{\"n\":1}");
  EXPECT_TRUE(store()->removeObject(object("host", "pools", "a")));
  EXPECT_EQ(store()->list({}).objects.size(), 2U);
}

TEST_F(EtcdChanges, AListingIsInTheOrderOfTheNames) {
  const std::vector<ObjectId> ids = {object("", "", "z"),     object("a", "", ""),
                                     object("a", "b", "c"),   object("a", "b", "c", "d"),
                                     object("a", "b", "c c"), object("a", "b", "c-"),
                                     object("a", "b/", ""),   object("a", "b~", ""),
                                     object("a/", "", ""),    object("aa", "", "")};
  for (auto id = ids.rbegin(); id != ids.rend(); ++id) store()->setField(*id, "n", int64_t{1});
  const auto listed = store()->list({}).objects;
  ASSERT_EQ(listed.size(), ids.size());
  for (size_t i = 0; i < ids.size(); ++i) {
    EXPECT_EQ(listed[i].id.component + "|" + listed[i].id.group + "|" + listed[i].id.key,
              ids[i].component + "|" + ids[i].group + "|" + ids[i].key);
  }
}

TEST_F(EtcdChanges, ASelectionIsOneComponentOrOneOfItsGroups) {
  for (const ObjectId &id : {object("a", "g", "1"), object("a", "g", "2"), object("a", "gg", "3"),
                             object("aa", "g", "4"), object("", "g", "5")}) {
    store()->setField(id, "n", int64_t{1});
  }
  EXPECT_EQ(store()->list({"a", {}}).objects.size(), 3U);
  EXPECT_EQ(store()->list({"a", "g"}).objects.size(), 2U);
  EXPECT_EQ(store()->list({"", "g"}).objects.size(), 1U);
  EXPECT_EQ(store()->list({"b", {}}).objects.size(), 0U);
}

TEST_F(EtcdChanges, AnotherPrefixIsAnotherStore) {
  put("host/pools/backup", R"({"a":1})");
  auto configuration = etcd_.configuration();
  configuration.prefixes = {"/kestrel2/x y"};
  const auto other = Kestrel::Etcd::openEtcdBackend(configuration);
  EXPECT_TRUE(other->list({}).objects.empty());
  other->setField(id_, "a", int64_t{2});
  EXPECT_EQ(etcd_.etcdctl({"get", "--print-value-only", "/kestrel2/x y/global/host/pools/backup"}),
            "{\"a\":2}\n");
  EXPECT_EQ(store()->read(id_), (Fields{{"a", int64_t{1}}}));
}

TEST_F(EtcdChanges, DamagedObjectsAreListedByKeyBesideTheOthers) {
  put("host/pools/backup", R"({"a":1})");
  put("host/pools/garbage", "x");
  for (const char *key : {"host/pools", "a/b/c/d/e", "a/b/%2f", "a/b/%41", "a/b/c/", "a/b/%"}) {
    put(key, R"({"a":1})");
    const auto listing = store()->list({});
    EXPECT_EQ(listing.objects.size(), 1U);
    ASSERT_EQ(listing.damaged.size(), 2U);
    EXPECT_EQ(listing.damaged[0].name, "/kestrel/global/" + std::string(key));
    EXPECT_EQ(listing.damaged[0].why, "the key is not that of an object");
    EXPECT_EQ(listing.damaged[1].name, "/kestrel/global/host/pools/garbage");
    EXPECT_THAT(listing.damaged[1].why, HasSubstr("the value is not JSON"));
    etcd_.etcdctl({"del", "/kestrel/global/" + std::string(key)});
  }
}

TEST_F(EtcdChanges, AListingLongerThanAPageIsWhole) {
  const auto all = objects(1100);
  for (size_t from = 0; from < all.size(); from += 100) {
    const auto begin = all.begin() + static_cast<std::ptrdiff_t>(from);
    store()->replace({begin, begin + 100});
  }
  const auto listed = store()->list({}).objects;
  ASSERT_EQ(listed.size(), all.size());
  EXPECT_EQ(listed.back().id.key, "11099");
}

TEST_F(EtcdChanges, AListingLargerThanAResponseIsWhole) {
  const std::string text(size_t{1} << 20, 'x');
  for (const auto &one : objects(20, text)) store()->replace({one});
  const auto listed = store()->list({}).objects;
  ASSERT_EQ(listed.size(), 20U);
  EXPECT_EQ(listed.back().fields, (Fields{{"n", text}}));
}

TEST_F(EtcdChanges, AnImportIsOneTransaction) {
  put("host/pools/10003", R"({"old":1})");
  put("host/pools/stays", R"({"old":1})");
  store()->replace(objects(128));
  EXPECT_EQ(store()->list({}).objects.size(), 129U);
  EXPECT_EQ(store()->read(object("host", "pools", "10003")), (Fields{{"n", int64_t{1}}}));
  const std::string json =
      etcd_.etcdctl({"get", "--prefix", "-w", "json", "/kestrel/global/host/pools/1"});
  const size_t first = json.find("\"mod_revision\"");
  const std::string changedAt = json.substr(first, json.find(',', first) - first);
  int count = 0;
  for (size_t at = first; at != std::string::npos; at = json.find(changedAt, at + 1)) ++count;
  EXPECT_EQ(count, 128);
}

TEST_F(EtcdChanges, AnImportOfNothingSendsNothing) {
  const std::string before = revision();
  store()->replace({});
  EXPECT_EQ(revision(), before);
}

TEST_F(EtcdChanges, OfAnObjectGivenTwiceTheLastIsImported) {
  store()->replace({{id_, {{"a", int64_t{1}}}}, {id_, {{"b", int64_t{2}}}}});
  EXPECT_EQ(store()->read(id_), (Fields{{"b", int64_t{2}}}));
}

TEST_F(EtcdChanges, AnImportBeyondTheOperationsLimitIsRefusedWhole) {
  const std::string why = refusalOf([&] { store()->replace(objects(129)); });
  EXPECT_THAT(why, HasSubstr("129 objects in one transaction"));
  EXPECT_THAT(why, HasSubstr("too many operations in txn request"));
  EXPECT_THAT(why, HasSubstr("--max-txn-ops"));
  EXPECT_TRUE(store()->list({}).objects.empty());
}

TEST_F(EtcdChanges, AnImportBeyondTheBytesLimitIsRefusedWhole) {
  const auto large = objects(20, std::string(100000, 'x'));
  const std::string why = refusalOf([&] { store()->replace(large); });
  EXPECT_THAT(why, HasSubstr("request is too large"));
  EXPECT_THAT(why, HasSubstr("--max-request-bytes"));
  EXPECT_TRUE(store()->list({}).objects.empty());
}

TEST_F(EtcdChanges, AnImportOfAValueWithoutJsonFormChangesNothing) {
  auto some = objects(3);
  some.back().fields["n"] = HUGE_VAL;
  EXPECT_NE(refusalOf([&] { store()->replace(some); }), "");
  EXPECT_TRUE(store()->list({}).objects.empty());
}

TEST_F(EtcdChanges, WritersAtTheSameTimeLoseNothing) {
  constexpr int kWriters = 6;
  constexpr int kFields = 20;
  std::vector<std::thread> writers;
  for (int writer = 0; writer < kWriters; ++writer) {
    writers.emplace_back([&, writer] {
      for (int field = 0; field < kFields; ++field) {
        const std::string name = std::to_string(writer) + "." + std::to_string(field);
        store()->setField(id_, name, int64_t{field});
        if (field % 2 == 1) store()->removeField(id_, name);
      }
    });
  }
  for (std::thread &writer : writers) writer.join();
  const auto fields = store()->read(id_);
  ASSERT_TRUE(fields);
  EXPECT_EQ(fields->size(), kWriters * kFields / 2);
}

TEST_F(EtcdChanges, AMoveIsOneTransactionBetweenLayers) {
  etcd_.etcdctl({"put", "/kestrel/canary/global/host/pools/backup"}, R"({"a":2,"b":2})");
  put("host/pools/backup", R"({"a":1,"c":1})");
  const auto run = store();
  EXPECT_TRUE(run->move(id_, "/kestrel/canary", "/kestrel"));
  EXPECT_EQ(run->read(id_), (Fields{{"a", int64_t{2}}, {"b", int64_t{2}}, {"c", int64_t{1}}}));
  EXPECT_EQ(etcd_.etcdctl({"get", "--prefix", "/kestrel/canary/"}), "");
  EXPECT_FALSE(run->move(id_, "/kestrel/canary", "/kestrel"));
}

TEST_F(EtcdChanges, MovesAndWritersAtTheSameTimeLoseNothing) {
  constexpr int kRounds = 30;
  auto canary = etcd_.configuration();
  canary.prefixes = {"/kestrel/canary"};
  std::thread writer([&] {
    const auto layer = Kestrel::Etcd::openEtcdBackend(canary);
    for (int i = 0; i < kRounds; ++i) layer->setField(id_, "n" + std::to_string(i), int64_t{i});
  });
  const auto mover = store();
  for (int i = 0; i < kRounds; ++i) (void)mover->move(id_, "/kestrel/canary", "/kestrel");
  writer.join();
  (void)mover->move(id_, "/kestrel/canary", "/kestrel");
  EXPECT_EQ(store()->read(id_)->size(), size_t{kRounds});
}

TEST_F(EtcdChanges, ALayerMustBeChosenWhereThereAreSeveral) {
  auto configuration = etcd_.configuration();
  configuration.prefixes = {"/kestrel/canary", "/kestrel"};
  const auto layered = Kestrel::Etcd::openEtcdBackend(configuration);
  for (const std::function<void()> &action :
       {std::function<void()>([&] { layered->setField(id_, "n", int64_t{1}); }),
        std::function<void()>([&] { (void)layered->removeObject(id_); }),
        std::function<void()>([&] { (void)layered->list({}); }), std::function<void()>([&] {
          layered->replace({{id_, {}}});
        })}) {
    EXPECT_THAT(refusalOf(action), HasSubstr("one of them must be chosen"));
  }
}

TEST_F(EtcdChanges, AFullServerRefusesWithItsLimitNamed) {
  etcd_.member(0).kill();
  TempFolder folder;
  EtcdOptions options;
  options.arguments = {"--quota-backend-bytes=65536"};
  const Etcd small(folder.path(), 1, options);
  const auto full = Kestrel::Etcd::openEtcdBackend(small.configuration());
  std::string why;
  for (int i = 0; i < 100 && why.empty(); ++i) {
    why = refusalOf([&] { full->setField(id_, "long", std::string(60000, 'x')); });
  }
  EXPECT_THAT(why, HasSubstr("--quota-backend-bytes"));
}

}  // namespace
}  // namespace Test
