// SPDX-License-Identifier: Apache-2.0
// Two tables: objects by their four-part id, and the typed fields of each. A field's value keeps
// its own SQLite type.
#include "kestrel/sqlite_tables.h"

#include <cmath>
#include <limits>

#include "kestrel/errors.h"
#include "kestrel/object_names.h"

namespace Kestrel {

namespace {

using Platform::Database;
using Platform::Run;
using Platform::SqliteError;
using Platform::Statement;

// The application id of a store's file: the letters KSTR, and 1263752274 in the text below.
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

constexpr const char *kList =
    "SELECT name, type, value, component, \"group\", \"key\", extra"
    " FROM object LEFT JOIN field ON field.object = object.id"
    " WHERE (?1 = 0 OR component = ?2) AND (?3 = 0 OR \"group\" = ?4)"
    " ORDER BY component, \"group\", \"key\", extra, name";

constexpr const char *kAddObject =
    "INSERT INTO object (component, \"group\", \"key\", extra) VALUES (?1, ?2, ?3, ?4)"
    " ON CONFLICT DO NOTHING";

constexpr const char *kFindObject =
    "SELECT id FROM object"
    " WHERE component = ?1 AND \"group\" = ?2 AND \"key\" = ?3 AND extra = ?4";

constexpr const char *kPutField =
    "INSERT INTO field (object, name, type, value) VALUES (?1, ?2, ?3, ?4)"
    " ON CONFLICT (object, name) DO UPDATE SET type = excluded.type, value = excluded.value";

constexpr const char *kRemoveField = "DELETE FROM field WHERE object = ?1 AND name = ?2";
constexpr const char *kRemoveFields = "DELETE FROM field WHERE object = ?1";
constexpr const char *kRemoveObject = "DELETE FROM object WHERE id = ?1";
constexpr const char *kRemoveEmptyObject =
    "DELETE FROM object WHERE id = ?1 AND NOT EXISTS (SELECT 1 FROM field WHERE object = ?1)";

// The columns 0 to 2 are a field's name, type and value. The tables' checks make them fit, unless
// the checks were switched off or the file is damaged.
Value valueOf(const Run &row) {
  const auto type = typeNamed(row.text(1));
  const int kind = row.type(2);
  if (type == Type::kInteger && kind == SQLITE_INTEGER) return row.integer(2);
  if (type == Type::kReal && kind == SQLITE_FLOAT) return row.real(2);
  if (type == Type::kReal && kind == SQLITE_TEXT && row.text(2) == "nan") {
    return std::numeric_limits<double>::quiet_NaN();
  }
  if (type == Type::kBoolean && kind == SQLITE_INTEGER) return row.integer(2) != 0;
  if (type == Type::kText && kind == SQLITE_TEXT) return row.text(2);
  throw SqliteError(SQLITE_CORRUPT,
                    "field \"" + row.text(0) + "\" does not hold a value of type " + row.text(1));
}

int64_t pragma(Database &database, const char *sql) {
  Statement statement(database, sql);
  Run run(statement);
  return run.step() ? run.integer(0) : 0;
}

// The rows of objects by their ids, for one change.
class Objects {
 public:
  explicit Objects(Database &database) : add_(database, kAddObject), find_(database, kFindObject) {}

  std::optional<int64_t> find(const ObjectId &id) {
    Run run(find_, id.component, id.group, id.key, id.extra);
    return run.step() ? std::optional(run.integer(0)) : std::nullopt;
  }

  int64_t findOrAdd(const ObjectId &id) {
    Run(add_, id.component, id.group, id.key, id.extra).finish();
    return find(id).value();
  }

 private:
  Statement add_, find_;
};

void writeField(Statement &put, int64_t object, const std::string &name, const Value &value) {
  const std::string_view type = typeName(typeOf(value));
  if (const auto *integer = std::get_if<int64_t>(&value)) {
    Run(put, object, name, type, *integer).finish();
  } else if (const auto *real = std::get_if<double>(&value)) {
    // SQLite stores NaN as NULL.
    if (std::isnan(*real)) {
      Run(put, object, name, type, "nan").finish();
    } else {
      Run(put, object, name, type, *real).finish();
    }
  } else if (const auto *truth = std::get_if<bool>(&value)) {
    Run(put, object, name, type, *truth ? 1 : 0).finish();
  } else {
    Run(put, object, name, type, std::get<std::string>(value)).finish();
  }
}

bool sameId(const ObjectId &a, const ObjectId &b) {
  return a.component == b.component && a.group == b.group && a.key == b.key && a.extra == b.extra;
}

std::string count(Database &database, const char *sql) {
  Statement statement(database, sql);
  Run run(statement);
  (void)run.step();  // a count always has its one row
  return std::to_string(run.integer(0));
}

}  // namespace

void createSchema(Database &database) {
  database.execute(kTables);
}

void checkSchema(Database &database, const std::string &path) {
  const int64_t application = pragma(database, "PRAGMA application_id");
  if (application != kApplicationId)
    throw storeError(path, "this file is not a configuration store");
  const int64_t version = pragma(database, "PRAGMA user_version");
  if (version != kSchemaVersion) {
    throw storeError(path, "schema version " + std::to_string(version) +
                               ", but this program knows only version " +
                               std::to_string(kSchemaVersion));
  }
}

// A row without a name is an object without fields.
const char *const kReadObject =
    "SELECT name, type, value FROM object LEFT JOIN field ON field.object = object.id"
    " WHERE component = ?1 AND \"group\" = ?2 AND \"key\" = ?3 AND extra = ?4";

std::optional<Fields> readObject(Statement &statement, const ObjectId &id) {
  Run row(statement, id.component, id.group, id.key, id.extra);
  if (!row.step()) return std::nullopt;
  Fields fields;
  do {
    if (!row.isNull(0)) fields.emplace(row.text(0), valueOf(row));
  } while (row.step());
  return fields;
}

Listing selectObjects(Database &database, const Selection &selection) {
  const std::string component = selection.component.value_or("");
  const std::string group = selection.group.value_or("");
  Statement list(database, kList);
  Run row(list, selection.component ? 1 : 0, component, selection.group ? 1 : 0, group);
  std::vector<StoredObject> objects;
  std::map<size_t, std::string> damaged;  // by index
  while (row.step()) {
    const ObjectId id{row.text(5), row.text(3), row.text(4), row.text(6)};
    if (objects.empty() || !sameId(objects.back().id, id)) objects.push_back({id, {}});
    try {
      if (!row.isNull(0)) objects.back().fields.emplace(row.text(0), valueOf(row));
    } catch (const SqliteError &error) {
      damaged.emplace(objects.size() - 1, error.what());
    }
  }
  Listing listing;
  for (size_t i = 0; i < objects.size(); ++i) {
    const auto found = damaged.find(i);
    if (found == damaged.end()) {
      listing.objects.push_back(std::move(objects[i]));
    } else {
      listing.damaged.push_back({describe(objects[i].id), found->second});
    }
  }
  return listing;
}

void putField(Database &database, const ObjectId &id, const std::string &field,
              const Value &value) {
  Statement put(database, kPutField);
  writeField(put, Objects(database).findOrAdd(id), field, value);
}

bool removeField(Database &database, const ObjectId &id, const std::string &field) {
  const auto object = Objects(database).find(id);
  if (!object) return false;
  Statement remove(database, kRemoveField);
  Run(remove, *object, field).finish();
  if (database.changedRows() == 0) return false;
  Statement removeEmpty(database, kRemoveEmptyObject);
  Run(removeEmpty, *object).finish();
  return true;
}

bool removeObject(Database &database, const ObjectId &id) {
  const auto object = Objects(database).find(id);
  if (!object) return false;
  Statement remove(database, kRemoveObject);
  Run(remove, *object).finish();
  return true;
}

void replaceObjects(Database &database, const std::vector<StoredObject> &objects) {
  Objects rows(database);
  Statement clear(database, kRemoveFields);
  Statement put(database, kPutField);
  for (const StoredObject &object : objects) {
    const int64_t id = rows.findOrAdd(object.id);
    Run(clear, id).finish();
    for (const auto &[name, value] : object.fields) writeField(put, id, name, value);
  }
}

std::vector<Detail> describeTables(Database &database) {
  Statement check(database, "PRAGMA quick_check(1)");
  Run run(check);
  if (run.step() && run.text(0) != "ok") throw SqliteError(SQLITE_CORRUPT, run.text(0));
  return {{"schema", "version " + std::to_string(kSchemaVersion)},
          {"objects", count(database, "SELECT count(*) FROM object")},
          {"fields", count(database, "SELECT count(*) FROM field")}};
}

}  // namespace Kestrel
