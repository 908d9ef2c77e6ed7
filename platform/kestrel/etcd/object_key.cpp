// SPDX-License-Identifier: Apache-2.0
// How ids are written as keys. How keys are read from a server is not part of it.
#include "kestrel/etcd/object_key.h"

#include <vector>

namespace Kestrel::Etcd {

namespace {

// KestrelConfigStore::sGlobalNamespace. The module links nothing of that library and has only its
// headers.
constexpr const char *kNamespace = "global";
constexpr size_t kParts = 3;  // component, group and key

bool isUnreserved(char c) {
  return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '-' ||
         c == '.' || c == '_' || c == '~';
}

int hexDigit(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  return -1;
}

std::optional<std::vector<std::string>> decodedParts(std::string_view text) {
  std::vector<std::string> parts;
  for (size_t at = 0;;) {
    const size_t slash = text.find('/', at);
    auto part = percentDecode(text.substr(at, slash == text.npos ? slash : slash - at));
    if (!part) return std::nullopt;
    parts.push_back(std::move(*part));
    if (slash == text.npos) return parts;
    at = slash + 1;
  }
}

}  // namespace

std::string percentEncode(std::string_view text) {
  constexpr const char *kHex = "0123456789ABCDEF";
  std::string encoded;
  for (const char c : text) {
    if (isUnreserved(c)) {
      encoded += c;
      continue;
    }
    const auto byte = static_cast<unsigned char>(c);
    encoded += {'%', kHex[byte >> 4], kHex[byte & 15]};
  }
  return encoded;
}

std::optional<std::string> percentDecode(std::string_view text) {
  std::string decoded;
  for (size_t at = 0; at < text.size(); ++at) {
    if (text[at] != '%') {
      decoded += text[at];
      continue;
    }
    const int high = at + 2 < text.size() ? hexDigit(text[at + 1]) : -1;
    const int low = at + 2 < text.size() ? hexDigit(text[at + 2]) : -1;
    if (high < 0 || low < 0) return std::nullopt;
    decoded += static_cast<char>(high << 4 | low);
    at += 2;
  }
  return decoded;
}

std::string keyRoot(const std::string &prefix) {
  return prefix + "/" + kNamespace + "/";
}

std::string objectPart(const ObjectId &id) {
  std::string part =
      percentEncode(id.component) + "/" + percentEncode(id.group) + "/" + percentEncode(id.key);
  if (!id.extra.empty()) part += "/" + percentEncode(id.extra);
  return part;
}

std::string objectKey(const std::string &prefix, const ObjectId &id) {
  return keyRoot(prefix) + objectPart(id);
}

std::optional<ObjectId> objectId(const std::string &prefix, const std::string &key) {
  const std::string start = keyRoot(prefix);
  if (key.compare(0, start.size(), start) != 0) return std::nullopt;
  const auto parts = decodedParts(std::string_view(key).substr(start.size()));
  if (!parts || parts->size() < kParts || parts->size() > kParts + 1) return std::nullopt;
  ObjectId id;
  id.component = (*parts)[0];
  id.group = (*parts)[1];
  id.key = (*parts)[2];
  if (parts->size() > kParts) id.extra = (*parts)[kParts];
  // Lower-case digits, needless encoding and an empty EXTRA make other keys than the object's.
  if (objectKey(prefix, id) != key) return std::nullopt;
  return id;
}

std::string selectionPart(const Selection &selection) {
  if (!selection.component) return "";
  const std::string part = percentEncode(*selection.component) + "/";
  return selection.group ? part + percentEncode(*selection.group) + "/" : part;
}

std::string selectionKey(const std::string &prefix, const Selection &selection) {
  return keyRoot(prefix) + selectionPart(selection);
}

std::string endOfPrefix(std::string prefix) {
  prefix.back() = static_cast<char>(prefix.back() + 1);
  return prefix;
}

}  // namespace Kestrel::Etcd
