// SPDX-License-Identifier: Apache-2.0
// Lets SQLite run out of memory, while the rest of the process has enough.
#pragma once

#include <dlfcn.h>
#include <sqlite3.h>

namespace Test {

class SqliteMemoryLimit {
 public:
  // moreBytes: what SQLite may take beyond what it has now. SQLite must be loaded already.
  explicit SqliteMemoryLimit(sqlite3_int64 moreBytes) {
    const auto used = reinterpret_cast<decltype(&sqlite3_memory_used)>(find("sqlite3_memory_used"));
    setLimit(used() + moreBytes + 1);  // 0 would be no limit
  }
  ~SqliteMemoryLimit() { setLimit(0); }
  SqliteMemoryLimit(const SqliteMemoryLimit &) = delete;
  SqliteMemoryLimit &operator=(const SqliteMemoryLimit &) = delete;

 private:
  static void *find(const char *name) {
    static void *const kLibrary = dlopen("libsqlite3.so.0", RTLD_NOW | RTLD_NOLOAD);
    return dlsym(kLibrary, name);
  }
  static void setLimit(sqlite3_int64 bytes) {
    reinterpret_cast<decltype(&sqlite3_hard_heap_limit64)>(find("sqlite3_hard_heap_limit64"))(
        bytes);
  }
};

}  // namespace Test
