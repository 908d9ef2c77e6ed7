// SPDX-License-Identifier: Apache-2.0
// Two tables: objects by their four-part id, and the typed fields of each.
#include "kestrel/sqlite_schema.h"

#include "kestrel/errors.h"

namespace Kestrel {

namespace {

// What `file` and SQLite know a store by: the letters KSTR, and 1263752274 in the text below.
constexpr int64_t kApplicationId = 0x4B535452;
static_assert(kApplicationId == 1263752274 && kSchemaVersion == 1);

// A real that is not a number is kept as the text 'nan', because SQLite makes NULL of NaN.
constexpr const char *kTables = R"sql(
BEGIN;
CREATE TABLE object (
  id INTEGER PRIMARY KEY,
  component TEXT NOT NULL CHECK (typeof(component) = 'text'),
  "group" TEXT NOT NULL CHECK (typeof("group") = 'text'),
  "key" TEXT NOT NULL CHECK (typeof("key") = 'text'),
  extra TEXT NOT NULL DEFAULT '' CHECK (typeof(extra) = 'text'),
  UNIQUE (component, "group", "key", extra)
);
CREATE TABLE field (
  object INTEGER NOT NULL REFERENCES object (id) ON DELETE CASCADE,
  name TEXT NOT NULL CHECK (typeof(name) = 'text' AND name <> ''),
  type TEXT NOT NULL,
  value BLOB NOT NULL,
  PRIMARY KEY (object, name),
  CHECK (CASE type
    WHEN 'integer' THEN typeof(value) = 'integer'
    WHEN 'real' THEN typeof(value) = 'real' OR value = 'nan'
    WHEN 'boolean' THEN typeof(value) = 'integer' AND value IN (0, 1)
    WHEN 'text' THEN typeof(value) = 'text'
    ELSE 0 END)
) WITHOUT ROWID;
PRAGMA application_id = 1263752274;
PRAGMA user_version = 1;
COMMIT;
)sql";

int64_t pragma(Platform::Database &database, const char *sql) {
  Platform::Statement statement(database, sql);
  Platform::Run run(statement);
  return run.step() ? run.integer(0) : 0;
}

}  // namespace

void createSchema(Platform::Database &database) {
  database.execute(kTables);
}

void checkSchema(Platform::Database &database, const std::string &path) {
  const int64_t application = pragma(database, "PRAGMA application_id");
  if (application != kApplicationId) throw storeError(path, "this file is no configuration store");
  const int64_t version = pragma(database, "PRAGMA user_version");
  if (version != kSchemaVersion) {
    throw storeError(path, "schema version " + std::to_string(version) +
                               ", but this program knows only version " +
                               std::to_string(kSchemaVersion));
  }
}

}  // namespace Kestrel
