// SPDX-License-Identifier: Apache-2.0
// One field of each of that many objects, looked up as poolctl does it: the store, the object and
// the field anew each time. Fails when one is missing.
//
// usage: store_lookups COUNT
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <string>

#include "platform/kestrel_config_store.h"

namespace {

bool lookUp(int index) {
  using KestrelConfigStore::ConfigStore;
  const auto store = ConfigStore::GetStore(KestrelConfigStore::sGlobalNamespace);
  if (!store) return false;
  const auto object = store->GetObject({"p" + std::to_string(index), "host", "pools", ""});
  long value = 0;
  return object && object->GetValue("sizeMB", &value) && value == 1000 + index;
}

}  // namespace

int main(int argc, char **argv) {
  if (argc != 2) return 2;
  try {
    for (int i = 0; i < std::atoi(argv[1]); ++i) {
      if (!lookUp(i)) return 1;
    }
  } catch (const std::exception &failure) {
    std::fprintf(stderr, "store_lookups: %s\n", failure.what());
    return 1;
  }
  return 0;
}
