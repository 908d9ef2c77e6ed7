// SPDX-License-Identifier: Apache-2.0
// The values that this host read last, in a file on the host: for a boot or an outage during which
// no member of the cluster responds.
//
// The file is used only by the user who wrote it, with the same endpoints, prefixes and user name
// in the configuration, and only while it is younger than max-age. It is replaced whole, is
// readable by its owner alone, and ends with a checksum.
#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <set>
#include <string>

#include "kestrel/configuration.h"

namespace Kestrel::Etcd {

// Keys and values of one revision.
struct StoredValues {
  std::string cluster;
  int64_t revision = 0;
  std::chrono::system_clock::time_point time;
  std::set<std::string> covered;              // the parts of the store that were read; "" is all
  std::map<std::string, std::string> values;  // by etcd key
};

class LastKnownGood {
 public:
  explicit LastKnownGood(const Configuration &configuration);

  // Replaces the file. Does nothing where the configuration names no file, or where the file holds
  // the same values and is younger than an hour. Returns why it could not be written; "": it was.
  std::string write(const StoredValues &values) const;

  // false, with the reason in *WHY and *VALUES untouched: no stored values may be used.
  bool read(StoredValues *values, std::string *why) const;

 private:
  std::string identity() const;
  bool isFresh(const std::string &head, std::chrono::system_clock::time_point now) const;

  const Configuration &configuration_;
};

}  // namespace Kestrel::Etcd
