// SPDX-License-Identifier: Apache-2.0
// Reads the exchange format of whole stores: YAML, a sequence of objects. The form of a plain
// scalar decides its type, as on kestrelctl's command line; a quoted one is a text.
#pragma once

#include <stdexcept>
#include <string>
#include <vector>

#include "kestrel/backend.h"

namespace Kestrel {

// what(): "FILE:LINE:COLUMN: text", or "FILE: text" where no place is known.
class ExchangeError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// fileName: for the messages. Throws ExchangeError, also for an object or a field given twice.
std::vector<StoredObject> readExchange(const std::string &text, const std::string &fileName);

}  // namespace Kestrel
