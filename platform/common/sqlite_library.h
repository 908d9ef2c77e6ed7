// SPDX-License-Identifier: Apache-2.0
// SQLite's functions, loaded when the first database is opened. Most runs of a program open none,
// and mapping the library would be a good part of their start.
#pragma once

#include <sqlite3.h>

namespace Platform {

// One row for each function that this project calls.
#define PLATFORM_SQLITE_FUNCTIONS(row)                                                            \
  row(bind_double) row(bind_int64) row(bind_null) row(bind_text64) row(busy_handler) row(changes) \
      row(close) row(column_bytes) row(column_double) row(column_int64) row(column_text)          \
          row(column_type) row(errmsg) row(errstr) row(exec) row(extended_result_codes)           \
              row(file_control) row(finalize) row(get_autocommit) row(last_insert_rowid)          \
                  row(open_v2) row(prepare_v3) row(reset) row(step)

struct SqliteLibrary {
// NOLINTNEXTLINE(bugprone-macro-parentheses): the name of a member takes none
#define PLATFORM_SQLITE_MEMBER(name) decltype(&sqlite3_##name) name;
  PLATFORM_SQLITE_FUNCTIONS(PLATFORM_SQLITE_MEMBER)
#undef PLATFORM_SQLITE_MEMBER
};

// Loaded by the first call and kept until the process ends. Throws SqliteError when the library
// cannot be had; the next call tries again.
const SqliteLibrary &sqliteLibrary();

}  // namespace Platform
