// SPDX-License-Identifier: Apache-2.0
// What is read and written in the tables, on an open database. Transactions and files are the
// backend's business; failures are SqliteErrors.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "common/sqlite.h"
#include "kestrel/backend.h"

namespace Kestrel {

// The text of the statement that lookUp() runs.
extern const char *const kLookUp;

std::optional<Fields> lookUp(Platform::Statement &statement, const ObjectId &id);
std::vector<StoredObject> selectObjects(Platform::Database &database, const Selection &selection);
void putField(Platform::Database &database, const ObjectId &id, const std::string &field,
              const Value &value);
bool removeField(Platform::Database &database, const ObjectId &id, const std::string &field);
bool removeObject(Platform::Database &database, const ObjectId &id);
void replaceObjects(Platform::Database &database, const std::vector<StoredObject> &objects);

// Checks every page of the file, then counts.
std::vector<Detail> describeTables(Platform::Database &database);

}  // namespace Kestrel
