// SPDX-License-Identifier: Apache-2.0
// The tables of the SQLite store and their version. Everything that a person may do to the file
// with the sqlite3 shell is checked by the tables themselves.
#pragma once

#include <string>

#include "common/sqlite.h"

namespace Kestrel {

inline constexpr int kSchemaVersion = 1;

// Makes the tables in an empty database, in one transaction.
void createSchema(Platform::Database &database);

// Throws a ConfigStoreException when the database is no store, or one of another version.
void checkSchema(Platform::Database &database, const std::string &path);

}  // namespace Kestrel
