// SPDX-License-Identifier: Apache-2.0
// Clients change and read the same objects at random, through proxies that cut and delay, while
// members are killed and stopped. Afterwards every revision of every key is read from etcd, and the
// results that the clients got are compared with that history.
//
// KESTREL_RANDOM_OPERATIONS and KESTREL_RANDOM_SEED choose another length and another order.
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <cstdlib>
#include <map>
#include <mutex>
#include <random>
#include <set>
#include <thread>

#include "cutting_proxy.h"
#include "etcd_world.h"
#include "kestrel/etcd/members.h"
#include "kestrel/etcd/object_key.h"
#include "kestrel/etcd/object_value.h"

namespace Test {
namespace {

using Kestrel::Fields;
using Kestrel::ObjectId;
using std::chrono::milliseconds;

constexpr int kClients = 8;
constexpr int kObjects = 4;

unsigned fromEnvironment(const char *name, unsigned otherwise) {
  const char *value = getenv(name);
  return value == nullptr ? otherwise : static_cast<unsigned>(std::strtoul(value, nullptr, 10));
}

enum class Result { kDone, kNothingToDo, kNotKnown, kFailed };

// One operation on a client's own field, which no other client writes.
struct Operation {
  ObjectId id;
  std::string field;
  int64_t value = 0;  // 0: the field is deleted
  Result result = Result::kFailed;
};

class EtcdRandom : public ServersFixture {
 protected:
  EtcdRandom() : ServersFixture(3) {
    for (const std::string &url : etcd_.urls()) {
      proxies_.push_back(std::make_unique<CuttingProxy>(url.substr(7), seed_++));
    }
  }

  Kestrel::Configuration behindProxies(size_t first) const {
    auto configuration = etcd_.configuration();
    for (size_t i = 0; i < proxies_.size(); ++i) {
      configuration.endpoints[i] = proxies_[(first + i) % proxies_.size()]->url();
    }
    configuration.timeout = milliseconds(3000);
    return configuration;
  }

  // A program has a store of its own for a few operations, as kestrelctl and poolctl do.
  void client(int number, int operations) {
    std::minstd_rand random(seed_ + static_cast<unsigned>(number));
    const auto pick = [&random](int count) {
      return std::uniform_int_distribution<int>(0, count - 1)(random);
    };
    const std::string field = "f" + std::to_string(number);
    std::map<std::string, int64_t> known;  // of the own field, by key; -1: not known
    for (int i = 0; i < operations; ++i) {
      const auto store = Kestrel::Etcd::openEtcdBackend(behindProxies(static_cast<size_t>(number)));
      const ObjectId id = object("c", "g", std::to_string(pick(kObjects)));
      if (pick(4) == 0) {
        checkRead(*store, id, field, known);
        continue;
      }
      Operation operation{id, field, pick(3) == 0 ? 0 : ++lastValue_, Result::kFailed};
      operation.result = attempt(*store, operation);
      int64_t &value = known[id.key];
      if (operation.result == Result::kDone) value = operation.value;
      if (operation.result == Result::kNotKnown) value = -1;
      if (operation.result == Result::kNothingToDo) {
        EXPECT_TRUE(value == 0 || value == -1) << "a field of " << field << " was lost";
        value = 0;
      }
      const std::lock_guard<std::mutex> lock(mutex_);
      operations_.push_back(operation);
    }
  }

  static Result attempt(Kestrel::Backend &store, const Operation &operation) {
    try {
      if (operation.value == 0) {
        const bool removed = store.removeField(operation.id, operation.field);
        return removed ? Result::kDone : Result::kNothingToDo;
      }
      store.setField(operation.id, operation.field, operation.value);
      return Result::kDone;
    } catch (const KestrelConfigStore::ConfigStoreException &error) {
      const bool notKnown = std::string(error.what()).find("is not known") != std::string::npos;
      return notKnown ? Result::kNotKnown : Result::kFailed;
    }
  }

  // A read is never older than the client's own last change.
  static void checkRead(Kestrel::Backend &store, const ObjectId &id, const std::string &field,
                        const std::map<std::string, int64_t> &known) {
    const auto expected = known.find(id.key);
    std::optional<Fields> fields;
    try {
      fields = store.read(id);
    } catch (const KestrelConfigStore::ConfigStoreException &) {
      return;
    }
    if (expected == known.end() || expected->second == -1) return;
    int64_t value = 0;
    if (fields && fields->count(field) != 0) value = std::get<int64_t>(fields->at(field));
    EXPECT_EQ(value, expected->second) << field << " of " << id.key;
  }

  // One member at a time is killed or stopped, so that there is a quorum most of the time. On the
  // main thread: a server ends with the thread that started it.
  void disturbWhile(const std::atomic<int> &busy) {
    std::minstd_rand random(seed_);
    while (busy > 0) {
      auto &member = etcd_.member(std::uniform_int_distribution<size_t>(0, 2)(random));
      const bool kill = random() % 2 == 0;
      kill ? member.kill() : member.stop();
      std::this_thread::sleep_for(milliseconds(300));
      kill ? member.start() : member.resume();
      std::this_thread::sleep_for(milliseconds(1500));
    }
  }

  void runAll(int operations) {
    std::atomic<int> busy{kClients};
    std::vector<std::thread> clients;
    for (int i = 0; i < kClients; ++i) {
      clients.emplace_back([this, i, operations, &busy] {
        client(i, operations / kClients);
        --busy;
      });
    }
    disturbWhile(busy);
    for (std::thread &thread : clients) thread.join();
    for (size_t i = 0; i < 3; ++i) etcd_.awaitReady(i);
  }

  // The object's fields at each of its changes, oldest first; before the first one it has none.
  std::vector<Fields> history(const ObjectId &id) {
    using namespace Kestrel::Etcd;
    Members members(etcd_.configuration());
    ReadRequest request;
    request.ranges = {{objectKey("/kestrel", id), ""}};
    ReadResponse response;
    const auto readAt = [&](int64_t revision) {
      request.revision = revision;
      (void)members.read(request, "history", Members::Freshness::kCurrent,
                         Deadline(std::chrono::seconds(20)), size_t{1} << 20,
                         [&](const std::string &json) { response = readResponse(request, json); });
    };
    readAt(0);
    const int64_t last = response.header.revision;
    std::vector<Fields> versions = {{}};
    int64_t changed = 0;
    for (int64_t revision = 2; revision <= last; ++revision) {
      readAt(revision);
      const auto &found = response.ranges[0].found;
      const int64_t now = found.empty() ? 0 : found[0].modRevision;
      if (now != changed) versions.push_back(now == 0 ? Fields{} : parseFields(found[0].value));
      changed = now;
    }
    return versions;
  }

  void compareWithHistory();

  unsigned seed_ = fromEnvironment("KESTREL_RANDOM_SEED", 1);
  std::vector<std::unique_ptr<CuttingProxy>> proxies_;
  std::mutex mutex_;
  std::vector<Operation> operations_;
  std::atomic<int64_t> lastValue_{0};
};

void EtcdRandom::compareWithHistory() {
  std::map<int64_t, int> made;         // how often each value was set
  std::map<std::string, int> deleted;  // by object and field
  for (int i = 0; i < kObjects; ++i) {
    const ObjectId id = object("c", "g", std::to_string(i));
    const auto versions = history(id);
    for (size_t at = 1; at < versions.size(); ++at) {
      const Fields &before = versions[at - 1], &after = versions[at];
      int changes = 0;
      for (const auto &[name, value] : after) {
        if (before.count(name) != 0 && before.at(name) == value) continue;
        ++changes;
        ++made[std::get<int64_t>(value)];
      }
      for (const auto &[name, value] : before) {
        if (after.count(name) != 0) continue;
        ++changes;
        ++deleted[id.key + name];
      }
      EXPECT_EQ(changes, 1) << "one change lost or made another of object " << id.key;
    }
  }
  std::map<std::string, std::pair<int, int>> deletes;  // reported done, and not known
  std::map<Result, int> counts;
  for (const Operation &operation : operations_) {
    ++counts[operation.result];
    if (operation.value == 0) {
      auto &[done, notKnown] = deletes[operation.id.key + operation.field];
      if (operation.result == Result::kDone) ++done;
      if (operation.result == Result::kNotKnown) ++notKnown;
      continue;
    }
    const int times = made[operation.value];
    switch (operation.result) {
      case Result::kDone:
        EXPECT_EQ(times, 1) << "set " << operation.value << " was reported as made";
        break;
      case Result::kNotKnown:
        EXPECT_LE(times, 1) << "set " << operation.value << " was made twice";
        break;
      default:
        EXPECT_EQ(times, 0) << "set " << operation.value << " was reported as not made";
    }
  }
  for (const auto &[name, reported] : deletes) {
    EXPECT_GE(deleted[name], reported.first) << name;
    EXPECT_LE(deleted[name], reported.first + reported.second) << name;
  }
  std::printf("%zu changes: %d made, %d had nothing to do, %d not known, %d failed\n",
              operations_.size(), counts[Result::kDone], counts[Result::kNothingToDo],
              counts[Result::kNotKnown], counts[Result::kFailed]);
  EXPECT_GT(counts[Result::kDone], 0);
}

TEST_F(EtcdRandom, ResultsAreThoseOfTheServersHistory) {
  runAll(static_cast<int>(fromEnvironment("KESTREL_RANDOM_OPERATIONS", 400)));
  compareWithHistory();
  int cuts = 0;
  for (const auto &proxy : proxies_) cuts += proxy->cuts();
  std::printf("%d connections cut, seed %u\n", cuts, fromEnvironment("KESTREL_RANDOM_SEED", 1));
  EXPECT_GT(cuts, 0);
}

}  // namespace
}  // namespace Test
