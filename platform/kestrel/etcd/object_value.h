// SPDX-License-Identifier: Apache-2.0
// How an object's fields become the value of its etcd key and back: one JSON object, a member for
// each field. 7 is an integer, 7.0 and 7e0 are real numbers, true is a truth value, "7" is a text.
#pragma once

#include <string>
#include <string_view>

#include "kestrel/backend.h"

namespace Kestrel::Etcd {

// Throws ValueError: not JSON, not an object, a member that is null, an array or an object, an
// integer beyond 64 bits, a real number beyond its range, a member given twice.
Fields parseFields(std::string_view json);

// The same, for the value of a key. Throws a ConfigStoreException that names the key.
Fields fieldsOf(const std::string &key, std::string_view json);

// Throws ValueError for what JSON has no form for: infinities, not-a-number, and bytes that are not
// UTF-8.
std::string formatFields(const Fields &fields);

}  // namespace Kestrel::Etcd
