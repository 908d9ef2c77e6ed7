// SPDX-License-Identifier: Apache-2.0
// What each operation asks of the cluster. Reads for people and for changes are linearizable reads
// of the present state. A change is made only when that state has not changed since.
#include "kestrel/etcd/etcd_backend.h"

#include <unistd.h>

#include <algorithm>
#include <map>
#include <random>
#include <thread>
#include <tuple>

#include "kestrel/errors.h"
#include "kestrel/etcd/last_known_good.h"
#include "kestrel/etcd/members.h"
#include "kestrel/etcd/object_key.h"
#include "kestrel/etcd/object_value.h"
#include "kestrel/etcd/run_snapshot.h"
#include "kestrel/text.h"

namespace Kestrel::Etcd {

namespace {

using Freshness = Members::Freshness;
using Milliseconds = std::chrono::milliseconds;

constexpr const char *kWhere = "etcd";

// A change that other writers keep overtaking ends at the first of these.
constexpr int kMaxAttempts = 100;
constexpr Milliseconds kMaxTime{10000};
constexpr int kMaxPauseMs = 50;

constexpr int64_t kPageSize = 512;

std::string valueOf(const std::string &key, const Fields &fields) {
  try {
    return formatFields(fields);
  } catch (const ValueError &error) {
    throw storeError(kWhere, key, error.what());
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
      : configuration_(configuration),
        members_(configuration_),
        snapshot_(configuration_, members_) {}

  std::optional<Fields> lookUp(const ObjectId &id) override { return snapshot_.lookUp(id); }
  RunSource source() const override { return snapshot_.source(); }

  std::optional<Fields> read(const ObjectId &id) override {
    std::optional<Fields> fields;
    for (LayerFields &layer : layers(id)) {
      if (!fields) fields.emplace();
      fields->merge(layer.fields);  // keeps what an earlier layer has
    }
    return fields;
  }

  std::vector<LayerFields> layers(const ObjectId &id) override {
    ReadRequest request;
    for (const std::string &prefix : configuration_.prefixes) {
      request.ranges.push_back({objectKey(prefix, id), ""});
    }
    const ReadResponse response = readNow(request, Members::kMaxResponseBytes);
    std::vector<LayerFields> layers;
    for (size_t i = 0; i < response.ranges.size(); ++i) {
      for (const KeyValue &pair : response.ranges[i].found) {
        layers.push_back({configuration_.prefixes[i], fieldsOf(pair.key, pair.value)});
      }
    }
    return layers;
  }

  Listing list(const Selection &selection) override {
    ReadRequest request;
    const std::string key = selectionKey(onlyPrefix(), selection);
    request.ranges = {{key, endOfPrefix(key)}};
    request.limit = kPageSize;
    Listing listing;
    while (takePage(&request, &listing)) {
    }
    std::sort(listing.objects.begin(), listing.objects.end(), before);
    return listing;
  }

  void setField(const ObjectId &id, const std::string &field, const Value &value) override {
    change({objectKey(onlyPrefix(), id)}, [&](std::vector<Fields> *objects) {
      objects->front()[field] = value;
      return true;
    });
  }

  bool removeField(const ObjectId &id, const std::string &field) override {
    return change({objectKey(onlyPrefix(), id)},
                  [&](std::vector<Fields> *objects) { return objects->front().erase(field) != 0; });
  }

  bool move(const ObjectId &id, const std::string &from, const std::string &to) override {
    return change({objectKey(from, id), objectKey(to, id)}, [](std::vector<Fields> *objects) {
      Fields &source = objects->front(), &target = objects->back();
      if (source.empty()) return false;
      source.merge(target);  // keeps the fields that the source has
      target = std::move(source);
      source.clear();
      return true;
    });
  }

  bool removeObject(const ObjectId &id) override {
    const std::string key = objectKey(onlyPrefix(), id);
    int64_t deleted = 0;
    members_.change(kDeletePath, deleteText(key), key, [&](const std::string &json) {
      deleted = readDeleted(json);
      if (deleted != 0) continueFrom(readHeader(json));
    });
    return deleted != 0;
  }

  void replace(const std::vector<StoredObject> &objects) override {
    if (objects.empty()) return;
    // etcd accepts a key once in a transaction; of an object that is given twice the last counts.
    std::map<std::string, std::string> values;
    for (const StoredObject &object : objects) {
      const std::string key = objectKey(onlyPrefix(), object.id);
      values[key] = valueOf(key, object.fields);
    }
    std::vector<KeyValue> pairs;
    pairs.reserve(values.size());
    for (auto &[key, value] : values) pairs.push_back({key, std::move(value), 0});
    const std::string subject = std::to_string(pairs.size()) + " objects in one transaction";
    members_.change(kTransactionPath, putAllText(pairs), subject,
                    [&](const std::string &json) { continueFrom(readHeader(json)); });
  }

  Health health() override {
    Health health;
    for (const std::string &prefix : configuration_.prefixes) {
      health.details.emplace_back("prefix", prefix);
    }
    for (const std::string &endpoint : members_.endpoints()) {
      const Members::Health member = members_.health(endpoint);
      health.details.emplace_back("member", endpoint + ": " + member.text);
      if (!member.problem.empty()) health.problem = endpoint + ": " + member.problem;
    }
    health.details.emplace_back("last good", describeLastKnownGood());
    try {
      probe(&health);
    } catch (const KestrelConfigStore::ConfigStoreException &error) {
      health.readable = false;
      health.problem = error.what();
    }
    return health;
  }

  // What a run has learned is kept to its end, above all that the store is gone.
  bool current() override { return true; }

 private:
  const std::string &onlyPrefix() const {
    if (configuration_.prefixes.size() == 1) return configuration_.prefixes.front();
    throw storeError(configuration_.file, "prefix",
                     "names several layers; one of them must be chosen");
  }

  void continueFrom(const Header &header) {
    members_.checkCluster(header);
    snapshot_.continueFrom(header);
  }

  // Reads the present state, which the cluster agrees on.
  ReadResponse readNow(const ReadRequest &request, size_t maxBytes,
                       Freshness allowed = Freshness::kCurrent, Freshness *freshness = nullptr) {
    ReadResponse response;
    const Freshness found =
        members_.read(request, request.ranges.front().key, allowed,
                      Deadline(configuration_.timeout), maxBytes, [&](const std::string &json) {
                        ReadResponse read = readResponse(request, json);
                        members_.checkCluster(read.header);
                        response = std::move(read);
                      });
    if (freshness != nullptr) *freshness = found;
    return response;
  }

  // false: this was the last page. The next one begins after the last key of this one, and is read
  // at the revision of the first.
  bool takePage(ReadRequest *request, Listing *listing) {
    const ReadResponse response = [&] {
      for (;;) {
        try {
          return readNow(*request, Members::kMaxResponseBytes);
        } catch (const RequestRefused &refused) {
          if (refused.why() != RequestRefused::Why::kTooLarge || request->limit == 1) throw;
          request->limit /= 2;
        }
      }
    }();
    request->revision = response.header.revision;
    const FoundRange &range = response.ranges.front();
    for (const KeyValue &pair : range.found) takeObject(pair, listing);
    if (!range.more || range.found.empty()) return false;
    request->ranges.front().key = range.found.back().key + '\0';
    return true;
  }

  void takeObject(const KeyValue &pair, Listing *listing) const {
    auto id = objectId(onlyPrefix(), pair.key);
    if (!id) {
      listing->damaged.push_back({pair.key, "the key is not that of an object"});
      return;
    }
    try {
      listing->objects.push_back({std::move(*id), parseFields(pair.value)});
    } catch (const ValueError &error) {
      listing->damaged.push_back({pair.key, error.what()});
    }
  }

  // Reads as a run does, so that its failures are those of a run. A role that does not allow the
  // whole prefix is enough for a run.
  void probe(Health *health) {
    ReadRequest request;
    for (const std::string &prefix : configuration_.prefixes) {
      const std::string key = selectionKey(prefix, {});
      request.ranges.push_back({key, endOfPrefix(key)});
    }
    request.limit = 1;
    try {
      Freshness freshness = Freshness::kCurrent;
      const auto response =
          readNow(request, Members::kMaxResponseBytes, Freshness::kAny, &freshness);
      health->details.emplace_back("revision", std::to_string(response.header.revision));
      if (freshness == Freshness::kCurrent) return;
      health->problem = "no quorum: values may be old, and no change is accepted";
    } catch (const RequestRefused &refused) {
      if (refused.why() != RequestRefused::Why::kPermission) throw;
      health->details.emplace_back(
          "permission", "not for the whole prefix: each component and group is read alone");
    }
  }

  std::string describeLastKnownGood() const {
    StoredValues values;
    std::string why;
    if (!LastKnownGood(configuration_).read(&values, &why)) return "cannot be used: " + why;
    return "revision " + std::to_string(values.revision) + ", read " + inUtc(values.time) + ", " +
           std::to_string(values.values.size()) + " objects";
  }

  std::vector<std::optional<KeyValue>> present(const std::vector<std::string> &keys) {
    ReadRequest request;
    for (const std::string &key : keys) request.ranges.push_back({key, ""});
    ReadResponse response = readNow(request, Members::kMaxResponseBytes);
    std::vector<std::optional<KeyValue>> found;
    for (FoundRange &range : response.ranges) {
      found.emplace_back();
      if (!range.found.empty()) found.back() = std::move(range.found.front());
    }
    return found;
  }

  // Compare and swap: makes the change on what the keys hold, if no other writer has changed them
  // since they were read; otherwise begins again with what they hold then. apply: false when there
  // is nothing to change. An object is deleted with its last field.
  template <typename Apply>
  bool change(const std::vector<std::string> &keys, const Apply &apply) {
    const Deadline deadline(kMaxTime);
    std::vector<std::optional<KeyValue>> found = present(keys);
    for (int attempt = 1;; ++attempt) {
      std::vector<Fields> objects;
      for (const auto &pair : found) {
        objects.push_back(pair ? fieldsOf(pair->key, pair->value) : Fields{});
      }
      if (!apply(&objects)) return false;
      std::vector<KeyChange> changes;
      for (size_t i = 0; i < keys.size(); ++i) {
        changes.push_back({keys[i], found[i] ? found[i]->modRevision : 0, std::nullopt});
        if (!objects[i].empty()) changes.back().value = valueOf(keys[i], objects[i]);
      }
      ChangeResponse response = send(changes);
      if (response.done) return true;
      if (attempt == kMaxAttempts || deadline.passed()) {
        throw storeError(kWhere, keys.front(),
                         "other writers keep changing it; nothing was changed");
      }
      found = std::move(response.found);
      std::this_thread::sleep_for(pauseAfter(attempt));
    }
  }

  // Writers that met once should not meet again.
  Milliseconds pauseAfter(int attempt) {
    const int longest = std::min(1 << std::min(attempt, 10), kMaxPauseMs);
    return Milliseconds(std::uniform_int_distribution<int>(0, longest)(random_));
  }

  ChangeResponse send(const std::vector<KeyChange> &changes) {
    ChangeResponse response;
    members_.change(kTransactionPath, changeText(changes), changes.front().key,
                    [&](const std::string &json) {
                      response = readChange(changes.size(), json);
                      if (response.done) continueFrom(response.header);
                    });
    return response;
  }

  const Configuration configuration_;
  Members members_;
  RunSnapshot snapshot_;
  std::minstd_rand random_{
      static_cast<unsigned>(getpid()) ^
      static_cast<unsigned>(Deadline::Clock::now().time_since_epoch().count())};
};

}  // namespace

std::shared_ptr<Backend> openEtcdBackend(const Configuration &configuration) {
  return std::make_shared<EtcdBackend>(configuration);
}

}  // namespace Kestrel::Etcd
