// SPDX-License-Identifier: Apache-2.0
// The lookups of one run, answered from one snapshot of the store.
//
// The first lookup reads everything that the run can need in one request: all keys of the prefixes.
// Where that is too large, or the user's role does not allow it, the component and group of the
// object are read instead, and where that fails too, the single key. All reads are at the revision
// of the first one. When no member responds to the first read, the last known good values are used.
#pragma once

#include <chrono>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "kestrel/backend.h"
#include "kestrel/configuration.h"
#include "kestrel/etcd/last_known_good.h"
#include "kestrel/etcd/members.h"

namespace Kestrel::Etcd {

class RunSnapshot {
 public:
  // Both must outlive the snapshot.
  RunSnapshot(const Configuration &configuration, Members &members);

  // The object's fields: each from the first layer that has it. Empty: no layer has the object.
  // Throws a ConfigStoreException: the object is damaged or may not be read, or the store is gone
  // for the rest of the run.
  std::optional<Fields> lookUp(const ObjectId &id);

  // Reads again after the run's own change, at its revision at the earliest.
  void continueFrom(const Header &header);

  RunSource source() const { return source_; }

 private:
  // What one request reads: the keys behind each prefix that begin with a text, or a single one.
  struct Part {
    std::string name;  // behind PREFIX/NAMESPACE/
    bool single = false;
  };

  void cover(const ObjectId &id);
  bool fetch(const Part &part, size_t maxBytes, int64_t maxKeys);
  void take(const Part &part, Members::Freshness freshness, ReadResponse response);
  void useLastKnownGood(const ClusterUnavailable &unavailable);
  void keepAsLastKnownGood();

  const Configuration &configuration_;
  Members &members_;
  LastKnownGood lastKnownGood_;
  StoredValues values_;
  std::set<std::string> coveredKeys_;  // single keys that were read, behind PREFIX/NAMESPACE/
  std::set<std::string> narrow_;       // parts that could not be read as a whole
  std::chrono::milliseconds left_;     // of the time for all lookups of the run
  bool fromFile_ = false;              // the values are the last known good ones
  RunSource source_;
};

}  // namespace Kestrel::Etcd
