// SPDX-License-Identifier: Apache-2.0
// The exchange format of whole stores: YAML, a sequence of objects. What a plain scalar is follows
// its form as on kestrelctl's command line, and a quoted one is a text, so that types survive.
#pragma once

#include <stdexcept>
#include <string>
#include <vector>

#include "kestrel/backend.h"

namespace Kestrel {

// what(): "FILE:LINE:COLUMN: text", or "FILE: text" where no place is to blame.
class ExchangeError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// The same objects always give the same bytes, and reading them gives the same objects. Throws
// ValueError for names and texts that are not UTF-8.
std::string writeExchange(const std::vector<StoredObject> &objects);

// fileName: for the messages. Throws ExchangeError; an object or a field given twice is one too.
std::vector<StoredObject> readExchange(const std::string &text, const std::string &fileName);

}  // namespace Kestrel
