// SPDX-License-Identifier: Apache-2.0
// Requests are put together by hand, for every part of them is base64 or a number; answers are
// foreign text and are read with care.
#include "kestrel/etcd/protocol.h"

#include <charconv>
#include <nlohmann/json.hpp>

#include "kestrel/etcd/base64.h"

namespace Kestrel::Etcd {

namespace {

using Json = nlohmann::json;

std::string member(const char *name, const std::string &bytes) {
  return std::string("\"") + name + "\":\"" + toBase64(bytes) + "\"";
}

std::string member(const char *name, int64_t number) {
  return std::string("\"") + name + "\":\"" + std::to_string(number) + "\"";
}

std::string putText(const std::string &key, const std::string &value) {
  return "{\"request_put\":{" + member("key", key) + "," + member("value", value) + "}}";
}

// No answer of etcd's is deeper than this. Foreign text without end must not become a tree of it.
constexpr int kMaxDepth = 16;

// Discarded: not JSON.
Json parse(const std::string &json) {
  const auto limitDepth = [](int depth, Json::parse_event_t, const Json &) {
    if (depth > kMaxDepth) throw ProtocolError("nested too deeply");
    return true;
  };
  return Json::parse(json, limitDepth, false);
}

Json parseObject(const std::string &json) {
  Json parsed = parse(json);
  if (parsed.is_discarded()) throw ProtocolError("not JSON");
  if (!parsed.is_object()) throw ProtocolError("no JSON object");
  return parsed;
}

// Null: left out.
const Json *find(const Json &object, const char *name) {
  const auto found = object.find(name);
  return found == object.end() || found->is_null() ? nullptr : &*found;
}

const Json *findOf(const Json &object, const char *name, Json::value_t type) {
  const Json *found = find(object, name);
  if (found != nullptr && found->type() != type) {
    throw ProtocolError(std::string("\"") + name + "\" is of another kind than expected");
  }
  return found;
}

std::string text(const Json &object, const char *name) {
  const Json *found = findOf(object, name, Json::value_t::string);
  return found == nullptr ? "" : found->get_ref<const std::string &>();
}

std::string bytes(const Json &object, const char *name) {
  auto decoded = fromBase64(text(object, name));
  if (!decoded) throw ProtocolError(std::string("\"") + name + "\" is no base64");
  return std::move(*decoded);
}

int64_t number(const Json &object, const char *name) {
  const std::string digits = text(object, name);
  if (digits.empty()) return 0;
  int64_t value = 0;
  const char *end = digits.data() + digits.size();
  const auto result = std::from_chars(digits.data(), end, value);
  if (result.ec != std::errc() || result.ptr != end || value < 0) {
    throw ProtocolError(std::string("\"") + name + "\" is no number");
  }
  return value;
}

bool truth(const Json &object, const char *name) {
  const Json *found = findOf(object, name, Json::value_t::boolean);
  return found != nullptr && found->get<bool>();
}

Header headerOf(const Json &response) {
  const Json *header = findOf(response, "header", Json::value_t::object);
  if (header == nullptr) throw ProtocolError("without a \"header\"");
  return {text(*header, "cluster_id"), number(*header, "revision")};
}

std::vector<KeyValue> keyValues(const Json &range) {
  std::vector<KeyValue> found;
  const Json *list = findOf(range, "kvs", Json::value_t::array);
  if (list == nullptr) return found;
  for (const Json &entry : *list) {
    if (!entry.is_object()) throw ProtocolError("\"kvs\" is of another kind than expected");
    found.push_back({bytes(entry, "key"), bytes(entry, "value"), number(entry, "mod_revision")});
  }
  return found;
}

// The one range of a transaction that was not made.
std::optional<KeyValue> foundInstead(const Json &response) {
  const Json *responses = findOf(response, "responses", Json::value_t::array);
  if (responses == nullptr || responses->size() != 1 || !responses->front().is_object()) {
    throw ProtocolError("without what the key holds");
  }
  const Json *range = findOf(responses->front(), "response_range", Json::value_t::object);
  if (range == nullptr) throw ProtocolError("without what the key holds");
  auto found = keyValues(*range);
  if (found.empty()) return std::nullopt;
  return std::move(found.front());
}

}  // namespace

std::string rangeText(const RangeRequest &request) {
  std::string json = "{" + member("key", request.key);
  if (!request.end.empty()) json += "," + member("range_end", request.end);
  if (request.limit != 0) json += "," + member("limit", request.limit);
  if (request.revision != 0) json += "," + member("revision", request.revision);
  if (request.serializable) json += ",\"serializable\":true";
  return json + "}";
}

std::string changeText(const ChangeRequest &request) {
  const std::string key = "{" + member("key", request.key) + "}";
  const std::string change = request.value ? putText(request.key, *request.value)
                                           : "{\"request_delete_range\":" + key + "}";
  return "{\"compare\":[{" + member("key", request.key) +
         ",\"target\":\"MOD\",\"result\":\"EQUAL\"," + member("mod_revision", request.modRevision) +
         "}],\"success\":[" + change + "],\"failure\":[{\"request_range\":" + key + "}]}";
}

std::string putAllText(const std::vector<KeyValue> &pairs) {
  std::string puts;
  for (const KeyValue &pair : pairs) {
    if (!puts.empty()) puts += ",";
    puts += putText(pair.key, pair.value);
  }
  return "{\"success\":[" + puts + "]}";
}

std::string deleteText(const std::string &key) {
  return "{" + member("key", key) + "}";
}

std::string authenticateText(const std::string &user, const std::string &password) {
  const Json json = {{"name", user}, {"password", password}};
  return json.dump(-1, ' ', false, Json::error_handler_t::replace);
}

RangeResponse readRange(const std::string &json) {
  const Json response = parseObject(json);
  return {headerOf(response), keyValues(response), truth(response, "more")};
}

ChangeResponse readChange(const std::string &json) {
  const Json response = parseObject(json);
  ChangeResponse result{headerOf(response), truth(response, "succeeded"), std::nullopt};
  if (!result.done) result.found = foundInstead(response);
  return result;
}

Header readHeader(const std::string &json) {
  return headerOf(parseObject(json));
}

int64_t readDeleted(const std::string &json) {
  const Json response = parseObject(json);
  (void)headerOf(response);
  return number(response, "deleted");
}

std::string readToken(const std::string &json) {
  std::string token = text(parseObject(json), "token");
  // It becomes a line of a header.
  if (token.empty() || token.find_first_of("\r\n") != token.npos) {
    throw ProtocolError("without a usable \"token\"");
  }
  return token;
}

StatusResponse readStatus(const std::string &json) {
  const Json response = parseObject(json);
  const std::string leader = text(response, "leader");  // a member's id, of 64 bits without a sign
  return {headerOf(response), text(response, "version"), !leader.empty() && leader != "0"};
}

std::optional<Refusal> readRefusal(const std::string &json) {
  const Json response = parse(json);
  if (!response.is_object()) return std::nullopt;
  const Json *code = find(response, "code");
  const Json *message = find(response, "message");
  if (message == nullptr) message = find(response, "error");
  if (code == nullptr || !code->is_number_integer()) return std::nullopt;
  if (message == nullptr || !message->is_string()) return std::nullopt;
  return Refusal{code->get<int64_t>(), message->get<std::string>()};
}

}  // namespace Kestrel::Etcd
