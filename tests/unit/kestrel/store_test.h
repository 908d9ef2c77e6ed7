// SPDX-License-Identifier: Apache-2.0
// A store of a test's own: a folder, a configuration file in it that KESTREL_CONF names, and short
// ways to put values in and to read them through the library.
#pragma once

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <memory>
#include <string>

#include "common/sqlite.h"
#include "kestrel/open.h"
#include "platform/kestrel_config_store.h"
#include "temp_folder.h"

namespace Kestrel {

class StoreTest : public ::testing::Test {
 protected:
  StoreTest() {
    configure("path = " + path() + "\n");
    setenv("KESTREL_CONF", file("kestrel.conf").c_str(), 1);
  }
  ~StoreTest() override { unsetenv("KESTREL_CONF"); }

  std::string file(const std::string &name) const { return (folder_.path() / name).string(); }
  std::string path() const { return file("store.db"); }
  void configure(const std::string &text) const { ::Test::writeFile(file("kestrel.conf"), text); }

  static ObjectId id(const std::string &key) { return {key, "host", "pools", ""}; }

  // Writes one field of the object "backup".
  static void put(const std::string &field, const Value &value) {
    openBackend(Access::kCreate)->setField(id("backup"), field, value);
  }

  // Runs a text on the file, as the sqlite3 shell would.
  void sql(const char *text) const {
    Platform::Database(path(), Platform::Database::Mode::kCreate, 1000).execute(text);
  }

  static std::shared_ptr<KestrelConfigStore::ConfigStore> store() {
    return KestrelConfigStore::ConfigStore::GetStore(KestrelConfigStore::sGlobalNamespace);
  }

  // The object "backup" through the library's front.
  static std::shared_ptr<KestrelConfigStore::StoreObject> object() {
    return store()->GetObject(id("backup"));
  }

  ::Test::TempFolder folder_;
};

// The message of the ConfigStoreException that F throws; empty when it throws none.
template <typename F>
std::string failureOf(const F &f) {
  try {
    f();
  } catch (const KestrelConfigStore::ConfigStoreException &error) {
    return error.what();
  }
  return {};
}

}  // namespace Kestrel
