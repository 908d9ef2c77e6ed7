// SPDX-License-Identifier: Apache-2.0
// What each operation asks of the cluster. Lookups are serializable reads of the run's revision;
// what a change is based on is read from the present state, and the change is made only when that
// has not changed meanwhile.
#include "kestrel/etcd/etcd_backend.h"

#include <unistd.h>

#include <algorithm>
#include <map>
#include <random>
#include <thread>
#include <tuple>

#include "kestrel/errors.h"
#include "kestrel/etcd/members.h"
#include "kestrel/etcd/object_key.h"
#include "kestrel/etcd/object_value.h"

namespace Kestrel::Etcd {

namespace {

using Milliseconds = std::chrono::milliseconds;

// A change that others keep overtaking ends at the first of these.
constexpr int kMaxAttempts = 100;
constexpr Milliseconds kMaxTime{10000};
constexpr int kMaxPauseMs = 50;

constexpr int64_t kPageSize = 512;

Fields fieldsOf(const KeyValue &pair) {
  try {
    return parseFields(pair.value);
  } catch (const ValueError &error) {
    throw storeError("etcd", pair.key, error.what());
  }
}

std::string valueOf(const std::string &key, const Fields &fields) {
  try {
    return formatFields(fields);
  } catch (const ValueError &error) {
    throw storeError("etcd", key, error.what());
  }
}

bool before(const StoredObject &a, const StoredObject &b) {
  const auto order = [](const ObjectId &id) {
    return std::tie(id.component, id.group, id.key, id.extra);
  };
  return order(a.id) < order(b.id);
}

class EtcdBackend : public Backend {
 public:
  explicit EtcdBackend(const Configuration &configuration)
      : prefix_(configuration.prefix), members_(configuration) {}

  std::optional<Fields> read(const ObjectId &id) override {
    RangeRequest request;
    request.key = objectKey(prefix_, id);
    const RangeResponse response = lookUp(std::move(request), Request::Kind::kRead);
    if (response.found.empty()) return std::nullopt;
    return fieldsOf(response.found.front());
  }

  std::vector<StoredObject> list(const Selection &selection) override {
    RangeRequest request;
    request.key = selectionKey(prefix_, selection);
    request.end = endOfPrefix(request.key);
    request.limit = kPageSize;
    std::vector<StoredObject> objects;
    while (takePage(&request, &objects)) {
    }
    std::sort(objects.begin(), objects.end(), before);
    return objects;
  }

  void setField(const ObjectId &id, const std::string &field, const Value &value) override {
    change(objectKey(prefix_, id), [&](Fields *fields) {
      (*fields)[field] = value;
      return true;
    });
  }

  bool removeField(const ObjectId &id, const std::string &field) override {
    return change(objectKey(prefix_, id),
                  [&](Fields *fields) { return fields->erase(field) != 0; });
  }

  bool removeObject(const ObjectId &id) override {
    const std::string key = objectKey(prefix_, id);
    int64_t deleted = 0;
    members_.ask({Request::Kind::kChange, kDeletePath, deleteText(key), key},
                 [&](const std::string &json) {
                   deleted = readDeleted(json);
                   if (deleted != 0) ownChange(readHeader(json));
                 });
    return deleted != 0;
  }

  void replace(const std::vector<StoredObject> &objects) override {
    if (objects.empty()) return;
    // etcd takes a key once in a transaction; of an object that is given twice the last holds.
    std::map<std::string, std::string> values;
    for (const StoredObject &object : objects) {
      const std::string key = objectKey(prefix_, object.id);
      values[key] = valueOf(key, object.fields);
    }
    std::vector<KeyValue> pairs;
    pairs.reserve(values.size());
    for (auto &[key, value] : values) pairs.push_back({key, std::move(value), 0});
    const std::string subject = std::to_string(pairs.size()) + " objects in one transaction";
    members_.ask({Request::Kind::kChange, kTransactionPath, putAllText(pairs), subject},
                 [&](const std::string &json) { ownChange(readHeader(json)); });
  }

  std::vector<Detail> details() override {
    std::vector<Detail> details{{"prefix", prefix_}};
    for (const std::string &endpoint : members_.endpoints()) {
      details.emplace_back("member", endpoint + ": " + members_.condition(endpoint));
    }
    return details;
  }

  // What a run has learned holds to its end, above all that the store is gone.
  bool current() override { return true; }

 private:
  // A read of the run's revision, or of the present one, which is then the run's.
  RangeResponse lookUp(RangeRequest request, Request::Kind kind) {
    request.serializable = true;
    request.revision = revision_;
    const std::string subject = request.key;
    RangeResponse response;
    try {
      members_.ask({kind, kRangePath, rangeText(request), subject}, [&](const std::string &json) {
        response = readRange(json);
        check(response.header);
        check(request, response);
      });
    } catch (const RequestRefused &refused) {
      if (refused.why() != RequestRefused::Why::kCompacted) throw;
      const std::string why =
          "the cluster has forgotten revision " + std::to_string(revision_) + " of this run";
      members_.giveUp(why);
      throw storeError("etcd", subject, why);
    }
    if (revision_ == 0) revision_ = response.header.revision;
    return response;
  }

  // Members of one cluster have one history; another cluster's revision would mean nothing.
  void check(const Header &header) {
    if (header.revision < 1) throw ProtocolError("without a revision");
    if (!cluster_.empty() && header.cluster != cluster_) {
      throw ProtocolError("the member belongs to another cluster");
    }
    cluster_ = header.cluster;
  }

  static void check(const RangeRequest &request, const RangeResponse &response) {
    for (const KeyValue &pair : response.found) {
      const bool asked = request.end.empty() ? pair.key == request.key
                                             : pair.key >= request.key && pair.key < request.end;
      if (!asked) throw ProtocolError("with a key that was not asked for");
    }
  }

  // false: this was the last page. The next one begins behind the last key of this one.
  bool takePage(RangeRequest *request, std::vector<StoredObject> *objects) {
    const RangeResponse response = [&] {
      for (;;) {
        try {
          return lookUp(*request, Request::Kind::kPage);
        } catch (const RequestRefused &refused) {
          if (refused.why() != RequestRefused::Why::kTooLargeResponse || request->limit == 1) throw;
          request->limit /= 2;
        }
      }
    }();
    for (const KeyValue &pair : response.found) {
      auto id = objectId(prefix_, pair.key);
      if (!id) throw storeError("etcd", pair.key, "the key is no object's");
      objects->push_back({std::move(*id), fieldsOf(pair)});
    }
    if (!response.more || response.found.empty()) return false;
    request->key = response.found.back().key + '\0';
    return true;
  }

  // A run that changes the store goes on from its own change.
  void ownChange(const Header &header) {
    check(header);
    if (revision_ != 0) revision_ = header.revision;
  }

  std::optional<KeyValue> present(const std::string &key) {
    RangeRequest request;
    request.key = key;
    RangeResponse response;
    members_.ask({Request::Kind::kRead, kRangePath, rangeText(request), key},
                 [&](const std::string &json) {
                   response = readRange(json);
                   check(response.header);
                   check(request, response);
                 });
    if (response.found.empty()) return std::nullopt;
    return std::move(response.found.front());
  }

  // Compare and swap: makes the change on what the key holds, as long as nobody else changes it in
  // between; otherwise begins anew with what it holds then. apply: false when there is nothing to
  // change. An object goes with its last field.
  template <typename Apply>
  bool change(const std::string &key, const Apply &apply) {
    const Deadline deadline(kMaxTime);
    std::optional<KeyValue> found = present(key);
    for (int attempt = 1;; ++attempt) {
      Fields fields = found ? fieldsOf(*found) : Fields{};
      if (!apply(&fields)) return false;
      ChangeRequest request{key, found ? found->modRevision : 0, std::nullopt};
      if (!fields.empty()) request.value = valueOf(key, fields);
      ChangeResponse response = send(request);
      if (response.done) return true;
      if (attempt == kMaxAttempts || deadline.passed()) {
        throw storeError("etcd", key, "others keep changing it; nothing was changed");
      }
      found = std::move(response.found);
      std::this_thread::sleep_for(pauseAfter(attempt));
    }
  }

  // Writers that met once should not meet again.
  Milliseconds pauseAfter(int attempt) {
    const int most = std::min(1 << std::min(attempt, 10), kMaxPauseMs);
    return Milliseconds(std::uniform_int_distribution<int>(0, most)(random_));
  }

  ChangeResponse send(const ChangeRequest &request) {
    ChangeResponse response;
    members_.ask({Request::Kind::kChange, kTransactionPath, changeText(request), request.key},
                 [&](const std::string &json) {
                   response = readChange(json);
                   if (response.done) ownChange(response.header);
                 });
    return response;
  }

  std::string prefix_;
  Members members_;
  std::string cluster_;   // empty: none has answered yet
  int64_t revision_ = 0;  // 0: likewise
  std::minstd_rand random_{
      static_cast<unsigned>(getpid()) ^
      static_cast<unsigned>(Deadline::Clock::now().time_since_epoch().count())};
};

}  // namespace

std::shared_ptr<Backend> openEtcdBackend(const Configuration &configuration) {
  return std::make_shared<EtcdBackend>(configuration);
}

}  // namespace Kestrel::Etcd
