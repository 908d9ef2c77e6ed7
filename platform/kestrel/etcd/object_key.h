// SPDX-License-Identifier: Apache-2.0
// How an object's id becomes an etcd key and back:
//
//   PREFIX/NAMESPACE/COMPONENT/GROUP/KEY[/EXTRA]
//
// Each part is percent-encoded, so that none holds a '/'; an empty part leaves its place empty
// ("PREFIX/global//g/k"). EXTRA is there when it is not empty, so each id has exactly one key.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "kestrel/backend.h"

namespace Kestrel::Etcd {

// Letters, digits, '-', '.', '_' and '~' stay; every other byte becomes %XX.
std::string percentEncode(std::string_view text);

// Nothing: a '%' without two hexadecimal digits.
std::optional<std::string> percentDecode(std::string_view text);

std::string objectKey(const std::string &prefix, const ObjectId &id);

// The id whose key this is. Nothing: no object has this key, for it is not the one that objectKey()
// makes of any id.
std::optional<ObjectId> objectId(const std::string &prefix, const std::string &key);

// What the keys of all selected objects begin with; no other object's key does.
std::string selectionKey(const std::string &prefix, const Selection &selection);

// The first key behind all that begin with PREFIX, which ends with '/'.
std::string endOfPrefix(std::string prefix);

}  // namespace Kestrel::Etcd
