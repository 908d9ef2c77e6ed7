// SPDX-License-Identifier: Apache-2.0
// The texts of etcd's HTTP/JSON gateway: requests are written and responses are read here, as
// values and without any I/O. In these texts numbers of 64 bits are strings, keys and values are
// base64, and members that are zero or empty are left out.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "kestrel/etcd/json_tree.h"

namespace Kestrel::Etcd {

inline constexpr const char *kRangePath = "/v3/kv/range";
inline constexpr const char *kTransactionPath = "/v3/kv/txn";
inline constexpr const char *kDeletePath = "/v3/kv/deleterange";
inline constexpr const char *kAuthenticatePath = "/v3/auth/authenticate";
inline constexpr const char *kStatusPath = "/v3/maintenance/status";

struct KeyValue {
  std::string key, value;
  int64_t modRevision = 0;  // the store's revision at the key's last change
};

// The part that all responses have in common.
struct Header {
  std::string cluster;   // the cluster's id, as a text
  int64_t revision = 0;  // the store's revision when the response was made
};

// One key, or all keys from KEY to before END.
struct KeyRange {
  std::string key;
  std::string end;  // empty: the one key
};

// A read of one range, or of several in one transaction and so at one revision.
struct ReadRequest {
  std::vector<KeyRange> ranges;
  int64_t limit = 0;          // the most keys of each range; 0: all
  int64_t revision = 0;       // 0: the present one
  bool serializable = false;  // the member responds from its own data, which may be old
};

struct FoundRange {
  std::vector<KeyValue> found;
  bool more = false;  // the limit left some out
};

struct ReadResponse {
  Header header;
  std::vector<FoundRange> ranges;  // as many as the request has, in its order
};

// The change of one key, for a transaction that is made only when the last change of each of its
// keys is still the one that is known.
struct KeyChange {
  std::string key;
  int64_t modRevision = 0;           // 0: the key does not exist
  std::optional<std::string> value;  // empty: the key is deleted
};

struct ChangeResponse {
  Header header;
  bool done = false;
  std::vector<std::optional<KeyValue>> found;  // when not done: what each key holds now
};

struct StatusResponse {
  Header header;
  std::string version;
  bool hasLeader = false;
  std::vector<std::string> errors;  // the member's own words about alarms
};

// A refusal: gRPC's number of it, and the server's text with control characters escaped.
struct Refusal {
  int64_t code = 0;
  std::string message;
};

const char *readPath(const ReadRequest &request);
std::string readText(const ReadRequest &request);
std::string changeText(const std::vector<KeyChange> &changes);
std::string putAllText(const std::vector<KeyValue> &pairs);  // one transaction without conditions
std::string deleteText(const std::string &key);
std::string authenticateText(const std::string &user, const std::string &password);

// All throw ProtocolError. readResponse() also refuses keys that were not asked for.
ReadResponse readResponse(const ReadRequest &request, const std::string &json);
ChangeResponse readChange(size_t changes, const std::string &json);
Header readHeader(const std::string &json);
int64_t readDeleted(const std::string &json);
std::string readToken(const std::string &json);
StatusResponse readStatus(const std::string &json);

// Empty: the text is not a refusal by etcd. Throws ProtocolError for what is not JSON.
std::optional<Refusal> readRefusal(const std::string &json);

}  // namespace Kestrel::Etcd
