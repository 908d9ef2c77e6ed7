// SPDX-License-Identifier: Apache-2.0
// The tables of the SQLite store, on an open database: their schema, and how objects are read from
// and written to them. Anything that a person may do to the file with the sqlite3 shell is checked
// by the tables themselves. Transactions and files are the backend's; failures are SqliteErrors,
// except where a function says otherwise.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "common/sqlite.h"
#include "kestrel/backend.h"

namespace Kestrel {

inline constexpr int kSchemaVersion = 1;

// Makes the tables in an empty database, in one transaction.
void createSchema(Platform::Database &database);

// Throws a ConfigStoreException when the database is not a store, or one of another version.
void checkSchema(Platform::Database &database, const std::string &path);

// The text of the statement that readObject() runs.
extern const char *const kReadObject;

std::optional<Fields> readObject(Platform::Statement &statement, const ObjectId &id);

// A field whose value is not of its type makes its object a damaged one.
Listing selectObjects(Platform::Database &database, const Selection &selection);

void putField(Platform::Database &database, const ObjectId &id, const std::string &field,
              const Value &value);
bool removeField(Platform::Database &database, const ObjectId &id, const std::string &field);
bool removeObject(Platform::Database &database, const ObjectId &id);
void replaceObjects(Platform::Database &database, const std::vector<StoredObject> &objects);

// Checks every page of the file, then counts.
std::vector<Detail> describeTables(Platform::Database &database);

}  // namespace Kestrel
