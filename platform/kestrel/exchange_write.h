// SPDX-License-Identifier: Apache-2.0
// Writes the exchange format of whole stores, which exchange_read reads.
#pragma once

#include <string>
#include <vector>

#include "kestrel/backend.h"

namespace Kestrel {

// The same objects always give the same bytes, and reading them gives the same objects. Throws
// ValueError for names and texts that are not UTF-8.
std::string writeExchange(const std::vector<StoredObject> &objects);

}  // namespace Kestrel
