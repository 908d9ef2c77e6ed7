// SPDX-License-Identifier: Apache-2.0
// Requests are written by hand, since each part of them is base64 or a number. Responses are
// untrusted text, and each member's kind is checked.
#include "kestrel/etcd/protocol.h"

#include <charconv>
#include <nlohmann/json.hpp>

#include "kestrel/etcd/base64.h"
#include "kestrel/text.h"

namespace Kestrel::Etcd {

namespace {

using Kind = JsonTree::Kind;

std::string member(const char *name, const std::string &bytes) {
  return std::string("\"") + name + "\":\"" + toBase64(bytes) + "\"";
}

std::string member(const char *name, int64_t number) {
  return std::string("\"") + name + "\":\"" + std::to_string(number) + "\"";
}

std::string putText(const std::string &key, const std::string &value) {
  return "{\"request_put\":{" + member("key", key) + "," + member("value", value) + "}}";
}

std::string rangeText(const KeyRange &range, const ReadRequest &request) {
  std::string json = "{" + member("key", range.key);
  if (!range.end.empty()) json += "," + member("range_end", range.end);
  if (request.limit != 0) json += "," + member("limit", request.limit);
  if (request.revision != 0) json += "," + member("revision", request.revision);
  if (request.serializable) json += ",\"serializable\":true";
  return json + "}";
}

JsonTree parseObject(const std::string &json) {
  JsonTree parsed = parseJson(json);
  if (parsed.kind != Kind::kObject) throw ProtocolError("not a JSON object");
  return parsed;
}

// Null: left out.
const JsonTree *find(const JsonTree &object, const char *name, Kind kind) {
  const JsonTree *found = object.find(name);
  if (found != nullptr && found->kind != kind) {
    throw ProtocolError(std::string("\"") + name + "\" is of another kind than expected");
  }
  return found;
}

std::string text(const JsonTree &object, const char *name) {
  const JsonTree *found = find(object, name, Kind::kText);
  return found == nullptr ? "" : found->text;
}

std::string bytes(const JsonTree &object, const char *name) {
  auto decoded = fromBase64(text(object, name));
  if (!decoded) throw ProtocolError(std::string("\"") + name + "\" is not base64");
  return std::move(*decoded);
}

int64_t number(const JsonTree &object, const char *name) {
  const std::string digits = text(object, name);
  if (digits.empty()) return 0;
  int64_t value = 0;
  const char *end = digits.data() + digits.size();
  const auto result = std::from_chars(digits.data(), end, value);
  if (result.ec != std::errc() || result.ptr != end || value < 0) {
    throw ProtocolError(std::string("\"") + name + "\" is not a number");
  }
  return value;
}

bool truth(const JsonTree &object, const char *name) {
  const JsonTree *found = find(object, name, Kind::kBoolean);
  return found != nullptr && found->truth;
}

Header headerOf(const JsonTree &response) {
  const JsonTree *header = find(response, "header", Kind::kObject);
  if (header == nullptr) throw ProtocolError("without a \"header\"");
  return {text(*header, "cluster_id"), number(*header, "revision")};
}

FoundRange foundRange(const JsonTree &range) {
  FoundRange result;
  result.more = truth(range, "more");
  const JsonTree *list = find(range, "kvs", Kind::kArray);
  if (list == nullptr) return result;
  result.found.reserve(list->items.size());
  for (const JsonTree &entry : list->items) {
    if (entry.kind != Kind::kObject) {
      throw ProtocolError("\"kvs\" is of another kind than expected");
    }
    result.found.push_back(
        {bytes(entry, "key"), bytes(entry, "value"), number(entry, "mod_revision")});
  }
  return result;
}

// The ranges that a transaction returns.
std::vector<FoundRange> transactionRanges(const JsonTree &response, size_t expected) {
  const JsonTree *responses = find(response, "responses", Kind::kArray);
  if (responses == nullptr || responses->items.size() != expected) {
    throw ProtocolError("without the ranges that were asked for");
  }
  std::vector<FoundRange> ranges;
  for (const JsonTree &entry : responses->items) {
    const JsonTree *range =
        entry.kind == Kind::kObject ? find(entry, "response_range", Kind::kObject) : nullptr;
    if (range == nullptr) throw ProtocolError("without the ranges that were asked for");
    ranges.push_back(foundRange(*range));
  }
  return ranges;
}

void checkAsked(const KeyRange &asked, const FoundRange &range) {
  for (const KeyValue &pair : range.found) {
    const bool inside =
        asked.end.empty() ? pair.key == asked.key : pair.key >= asked.key && pair.key < asked.end;
    if (!inside) throw ProtocolError("with a key that was not asked for");
  }
}

}  // namespace

const char *readPath(const ReadRequest &request) {
  return request.ranges.size() == 1 ? kRangePath : kTransactionPath;
}

std::string readText(const ReadRequest &request) {
  if (request.ranges.size() == 1) return rangeText(request.ranges.front(), request);
  std::string ranges;
  for (const KeyRange &range : request.ranges) {
    if (!ranges.empty()) ranges += ",";
    ranges += "{\"request_range\":" + rangeText(range, request) + "}";
  }
  return "{\"success\":[" + ranges + "]}";
}

std::string changeText(const std::vector<KeyChange> &changes) {
  std::string compares, operations, ranges;
  const auto append = [](std::string *list, const std::string &entry) {
    *list += (list->empty() ? "" : ",") + entry;
  };
  for (const KeyChange &change : changes) {
    const std::string key = "{" + member("key", change.key) + "}";
    append(&compares, "{" + member("key", change.key) +
                          ",\"target\":\"MOD\",\"result\":\"EQUAL\"," +
                          member("mod_revision", change.modRevision) + "}");
    append(&operations, change.value ? putText(change.key, *change.value)
                                     : "{\"request_delete_range\":" + key + "}");
    append(&ranges, "{\"request_range\":" + key + "}");
  }
  return "{\"compare\":[" + compares + "],\"success\":[" + operations + "],\"failure\":[" + ranges +
         "]}";
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
  const nlohmann::json json = {{"name", user}, {"password", password}};
  return json.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace);
}

ReadResponse readResponse(const ReadRequest &request, const std::string &json) {
  const JsonTree tree = parseObject(json);
  ReadResponse response{headerOf(tree), {}};
  if (response.header.revision < 1) throw ProtocolError("without a revision");
  if (request.ranges.size() == 1) {
    response.ranges.push_back(foundRange(tree));
  } else {
    response.ranges = transactionRanges(tree, request.ranges.size());
  }
  for (size_t i = 0; i < request.ranges.size(); ++i) {
    checkAsked(request.ranges[i], response.ranges[i]);
  }
  return response;
}

ChangeResponse readChange(size_t changes, const std::string &json) {
  const JsonTree tree = parseObject(json);
  ChangeResponse response{headerOf(tree), truth(tree, "succeeded"), {}};
  if (response.done) return response;
  for (FoundRange &range : transactionRanges(tree, changes)) {
    response.found.emplace_back();
    if (!range.found.empty()) response.found.back() = std::move(range.found.front());
  }
  return response;
}

Header readHeader(const std::string &json) {
  return headerOf(parseObject(json));
}

int64_t readDeleted(const std::string &json) {
  const JsonTree response = parseObject(json);
  (void)headerOf(response);
  return number(response, "deleted");
}

std::string readToken(const std::string &json) {
  std::string token = text(parseObject(json), "token");
  // It becomes a line of an HTTP header.
  if (token.empty() || token.find_first_of("\r\n") != token.npos) {
    throw ProtocolError("without a usable \"token\"");
  }
  return token;
}

StatusResponse readStatus(const std::string &json) {
  const JsonTree response = parseObject(json);
  const std::string leader = text(response, "leader");  // a member's id: 64 bits without a sign
  StatusResponse status{
      headerOf(response), text(response, "version"), !leader.empty() && leader != "0", {}};
  if (const JsonTree *errors = find(response, "errors", Kind::kArray)) {
    for (const JsonTree &error : errors->items) status.errors.push_back(escaped(error.text));
  }
  return status;
}

std::optional<Refusal> readRefusal(const std::string &json) {
  const JsonTree response = parseJson(json);
  const JsonTree *code = response.find("code");
  const JsonTree *message = response.find("message");
  if (message == nullptr) message = response.find("error");
  if (code == nullptr || code->kind != Kind::kNumber) return std::nullopt;
  if (message == nullptr || message->kind != Kind::kText) return std::nullopt;
  Refusal refusal{0, escaped(message->text)};
  const char *end = code->text.data() + code->text.size();
  const auto result = std::from_chars(code->text.data(), end, refusal.code);
  if (result.ec != std::errc() || result.ptr != end) return std::nullopt;
  return refusal;
}

}  // namespace Kestrel::Etcd
