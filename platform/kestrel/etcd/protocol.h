// SPDX-License-Identifier: Apache-2.0
// The texts of etcd's HTTP/JSON gateway: requests are made and answers read here, as values and
// without any I/O. Numbers of 64 bits are texts there, keys and values are base64, and what is zero
// or empty is left out.
#pragma once

#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

namespace Kestrel::Etcd {

// What came back is not what etcd answers.
class ProtocolError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

inline constexpr const char *kRangePath = "/v3/kv/range";
inline constexpr const char *kTransactionPath = "/v3/kv/txn";
inline constexpr const char *kDeletePath = "/v3/kv/deleterange";
inline constexpr const char *kAuthenticatePath = "/v3/auth/authenticate";
inline constexpr const char *kStatusPath = "/v3/maintenance/status";

struct KeyValue {
  std::string key, value;
  int64_t modRevision = 0;  // the store's revision at the key's last change
};

// What every answer begins with.
struct Header {
  std::string cluster;   // the cluster's id, as a text
  int64_t revision = 0;  // the store's present revision
};

struct RangeRequest {
  std::string key;
  std::string end;  // empty: the one key; otherwise all keys from KEY to before END
  int64_t limit = 0;
  bool serializable = false;  // the asked member answers by itself
  int64_t revision = 0;       // 0: the present one
};

struct RangeResponse {
  Header header;
  std::vector<KeyValue> found;
  bool more = false;  // the limit left some out
};

// Puts the value only when the key's last change is still the one that is known, and otherwise
// answers what the key holds now. Without a value the key is deleted.
struct ChangeRequest {
  std::string key;
  int64_t modRevision = 0;  // 0: there is no such key
  std::optional<std::string> value;
};

struct ChangeResponse {
  Header header;
  bool done = false;
  std::optional<KeyValue> found;  // when not done
};

struct StatusResponse {
  Header header;
  std::string version;
  bool hasLeader = false;
};

// A refusal: a number of gRPC's and a text of the server's.
struct Refusal {
  int64_t code = 0;
  std::string message;
};

std::string rangeText(const RangeRequest &request);
std::string changeText(const ChangeRequest &request);
std::string putAllText(const std::vector<KeyValue> &pairs);  // one transaction without conditions
std::string deleteText(const std::string &key);
std::string authenticateText(const std::string &user, const std::string &password);

// All throw ProtocolError.
RangeResponse readRange(const std::string &json);
ChangeResponse readChange(const std::string &json);
Header readHeader(const std::string &json);
int64_t readDeleted(const std::string &json);
std::string readToken(const std::string &json);
StatusResponse readStatus(const std::string &json);

// Nothing: the text is no refusal of etcd's. Throws ProtocolError as the others do.
std::optional<Refusal> readRefusal(const std::string &json);

}  // namespace Kestrel::Etcd
