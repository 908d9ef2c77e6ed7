// SPDX-License-Identifier: Apache-2.0
// Exchange files on disk and on the standard streams. The format is the library's.
#pragma once

#include <string>
#include <vector>

#include "kestrel/backend.h"

namespace Kestrelctl {

// Writes to standard output where FILE is empty or "-". A file is replaced whole or not at all.
void writeExchangeFile(const std::string &file, const std::vector<Kestrel::StoredObject> &objects);

// Reads standard input where FILE is "-".
std::vector<Kestrel::StoredObject> readExchangeFile(const std::string &file);

}  // namespace Kestrelctl
