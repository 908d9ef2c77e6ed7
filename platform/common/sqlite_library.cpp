// SPDX-License-Identifier: Apache-2.0
// Finds SQLite's shared library by the name under which every program links it.
#include "common/sqlite_library.h"

#include <dlfcn.h>

#include "common/sqlite.h"

namespace Platform {
namespace {

constexpr const char *kLibrary = "libsqlite3.so.0";

[[noreturn]] void failToLoad() {
  const char *const reason = dlerror();
  throw SqliteError(SQLITE_ERROR, reason != nullptr ? reason : kLibrary);
}

template <typename Function>
void find(void *library, const char *name, Function &function) {
  void *const address = dlsym(library, name);
  if (address == nullptr) failToLoad();
  function = reinterpret_cast<Function>(address);
}

SqliteLibrary load() {
  // Never closed: databases may live until the process ends.
  void *const library = dlopen(kLibrary, RTLD_NOW | RTLD_LOCAL);
  if (library == nullptr) failToLoad();
  SqliteLibrary functions;
#define PLATFORM_SQLITE_FIND(name) find(library, "sqlite3_" #name, functions.name);
  PLATFORM_SQLITE_FUNCTIONS(PLATFORM_SQLITE_FIND)
#undef PLATFORM_SQLITE_FIND
  return functions;
}

}  // namespace

const SqliteLibrary &sqliteLibrary() {
  static const SqliteLibrary library = load();
  return library;
}

}  // namespace Platform
