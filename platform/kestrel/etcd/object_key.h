// SPDX-License-Identifier: Apache-2.0
// How an object's id becomes an etcd key and back:
//
//   PREFIX/NAMESPACE/COMPONENT/GROUP/KEY[/EXTRA]
//
// Each part is percent-encoded, so that none holds a '/'. An empty part stays empty
// ("PREFIX/global//g/k"). EXTRA is left out when it is empty, so that each id has exactly one key.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "kestrel/backend.h"

namespace Kestrel::Etcd {

// Letters, digits, '-', '.', '_' and '~' stay as they are; every other byte becomes %XX.
std::string percentEncode(std::string_view text);

// Empty: a '%' without two hexadecimal digits.
std::optional<std::string> percentDecode(std::string_view text);

std::string objectKey(const std::string &prefix, const ObjectId &id);

// What all keys of a prefix begin with ("PREFIX/NAMESPACE/"), and what follows it in an object's
// key and in the keys of all selected objects.
std::string keyRoot(const std::string &prefix);
std::string objectPart(const ObjectId &id);
std::string selectionPart(const Selection &selection);

// The id that objectKey() makes this key of. Empty: not the key of an id.
std::optional<ObjectId> objectId(const std::string &prefix, const std::string &key);

// What the keys of all selected objects, and no others, begin with.
std::string selectionKey(const std::string &prefix, const Selection &selection);

// The first key after all keys that begin with PREFIX, which ends with '/'.
std::string endOfPrefix(std::string prefix);

}  // namespace Kestrel::Etcd
