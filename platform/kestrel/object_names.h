// SPDX-License-Identifier: Apache-2.0
// What may name an object and its fields, the same for every engine, and how an object is called
// in messages.
#pragma once

#include <string>

#include "kestrel/backend.h"

namespace Kestrel {

// The parts of an id are UTF-8 without NUL and may be empty. Throws ValueError.
void checkId(const ObjectId &id);

// The same, and a field's name is not empty.
void checkFieldName(const std::string &name);

// "COMPONENT/GROUP/KEY" or "COMPONENT/GROUP/KEY/EXTRA".
std::string describe(const ObjectId &id);

}  // namespace Kestrel
