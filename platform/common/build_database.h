// SPDX-License-Identifier: Apache-2.0
// Makes an SQLite database that is whole before any other process can see it.
#pragma once

#include <functional>
#include <string>

#include "common/sqlite.h"

namespace Platform {

// Makes the database FILE, a name beside the final one that no other process uses: replaces what a
// killed process left there, calls FILL, checks the result and flushes it to the disk. The caller
// then publishes it by rename or link. Throws SqliteError and what FILL throws; then FILE and the
// files that SQLite puts beside it are removed.
void buildDatabase(const std::string &file, const std::function<void(Database &)> &fill);

// Removes a database and the files that SQLite puts beside it, as far as they exist.
void removeDatabase(const std::string &file) noexcept;

}  // namespace Platform
