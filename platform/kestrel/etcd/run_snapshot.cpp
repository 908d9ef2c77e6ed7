// SPDX-License-Identifier: Apache-2.0
// What is read, when, and what a failure means for the rest of the run.
#include "kestrel/etcd/run_snapshot.h"

#include <algorithm>
#include <utility>

#include "kestrel/errors.h"
#include "kestrel/etcd/object_key.h"
#include "kestrel/etcd/object_value.h"

namespace Kestrel::Etcd {

namespace {

using Milliseconds = std::chrono::milliseconds;

constexpr const char *kWhere = "etcd";

// A store beyond these is read by component and group: most of it is then of no use to one host.
constexpr int64_t kMaxKeys = 10000;
constexpr size_t kMaxBytes = size_t{4} << 20;

}  // namespace

RunSnapshot::RunSnapshot(const Configuration &configuration, Members &members)
    : configuration_(configuration),
      members_(members),
      lastKnownGood_(configuration),
      left_(configuration.runTimeout) {
  source_.name = "none";
}

std::optional<Fields> RunSnapshot::lookUp(const ObjectId &id) {
  cover(id);
  std::optional<Fields> fields;
  for (const std::string &prefix : configuration_.prefixes) {
    const auto found = values_.values.find(objectKey(prefix, id));
    if (found == values_.values.end()) continue;
    if (!fields) fields.emplace();
    fields->merge(fieldsOf(found->first, found->second));  // keeps what an earlier layer has
  }
  return fields;
}

// Makes sure that the object's keys have been read.
void RunSnapshot::cover(const ObjectId &id) {
  const std::string group = selectionPart({id.component, id.group});
  const std::string key = objectPart(id);
  if (values_.covered.count("") != 0 || values_.covered.count(group) != 0 ||
      coveredKeys_.count(key) != 0) {
    return;
  }
  try {
    if (fetch({"", false}, kMaxBytes, kMaxKeys)) return;
    if (fetch({group, false}, kMaxBytes, kMaxKeys)) return;
    (void)fetch({key, true}, Members::kMaxResponseBytes, 0);
  } catch (const ClusterUnavailable &unavailable) {
    useLastKnownGood(unavailable);
    if (values_.covered.count("") == 0 && values_.covered.count(group) == 0) throw;
  }
}

// false: the part is too large, or its keys may not all be read. A single key fails instead.
bool RunSnapshot::fetch(const Part &part, size_t maxBytes, int64_t maxKeys) {
  if (narrow_.count(part.name) != 0) return false;
  ReadRequest request;
  for (const std::string &prefix : configuration_.prefixes) {
    const std::string key = keyRoot(prefix) + part.name;
    request.ranges.push_back({key, part.single ? "" : endOfPrefix(key)});
  }
  request.limit = maxKeys;
  request.revision = values_.revision;
  const std::string subject = request.ranges.front().key;
  if (left_ == Milliseconds::zero()) {
    members_.giveUp("run-timeout-ms is used up");
    throw storeError(kWhere, subject, "run-timeout-ms is used up");
  }
  const Deadline deadline(std::min(configuration_.timeout, left_));
  const auto start = Deadline::Clock::now();
  ReadResponse response;
  try {
    const auto freshness = members_.read(request, subject, Members::Freshness::kAny, deadline,
                                         maxBytes, [&](const std::string &json) {
                                           ReadResponse read = readResponse(request, json);
                                           members_.checkCluster(read.header);
                                           response = std::move(read);
                                         });
    left_ -= std::min(left_, std::chrono::ceil<Milliseconds>(Deadline::Clock::now() - start));
    for (const FoundRange &range : response.ranges) {
      if (!range.more) continue;
      if (values_.revision == 0) values_.revision = response.header.revision;
      narrow_.insert(part.name);
      return false;
    }
    take(part, freshness, std::move(response));
    return true;
  } catch (const RequestRefused &refused) {
    left_ -= std::min(left_, std::chrono::ceil<Milliseconds>(Deadline::Clock::now() - start));
    if (refused.why() == RequestRefused::Why::kCompacted) {
      const std::string why = "the cluster no longer has revision " +
                              std::to_string(values_.revision) + ", which this run reads";
      members_.giveUp(why);
      throw storeError(kWhere, subject, why);
    }
    const bool narrower = refused.why() == RequestRefused::Why::kTooLarge ||
                          refused.why() == RequestRefused::Why::kPermission;
    if (part.single || !narrower) throw;
    narrow_.insert(part.name);
    return false;
  }
}

void RunSnapshot::take(const Part &part, Members::Freshness freshness, ReadResponse response) {
  if (values_.revision == 0) values_.revision = response.header.revision;
  values_.cluster = response.header.cluster;
  values_.time = std::chrono::system_clock::now();
  for (FoundRange &range : response.ranges) {
    for (KeyValue &pair : range.found) {
      values_.values[std::move(pair.key)] = std::move(pair.value);
    }
  }
  (part.single ? coveredKeys_ : values_.covered).insert(part.name);
  const bool old = freshness == Members::Freshness::kAny;
  if (source_.name != "etcd without a quorum") {
    source_ = {old ? "etcd without a quorum" : "etcd", values_.revision, values_.time,
               old ? "no quorum responded: the values are those of one member" : ""};
  }
  if (!part.single) keepAsLastKnownGood();
}

// Values of another moment are never mixed in: only a run that has read nothing yet may use them.
void RunSnapshot::useLastKnownGood(const ClusterUnavailable &unavailable) {
  if (source_.problem.empty()) source_.problem = unavailable.what();
  if (values_.revision != 0 || fromFile_) return;
  std::string why;
  if (!lastKnownGood_.read(&values_, &why)) {
    source_.problem += "; the last known good values: " + why;
    return;
  }
  fromFile_ = true;
  source_ = {"last known good", values_.revision, values_.time, unavailable.what()};
}

void RunSnapshot::keepAsLastKnownGood() {
  // A run is not worse for a full disk. The file says itself how old it is.
  (void)lastKnownGood_.write(values_);
}

void RunSnapshot::continueFrom(const Header &header) {
  if (values_.revision == 0) return;
  values_ = StoredValues();
  values_.revision = header.revision;
  coveredKeys_.clear();
}

}  // namespace Kestrel::Etcd
