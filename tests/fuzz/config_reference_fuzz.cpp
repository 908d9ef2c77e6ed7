// SPDX-License-Identifier: Apache-2.0
// Any document as a reference to the configuration store. Its first byte says what the store holds.
#include <cstdint>
#include <stdexcept>
#include <string>

#include "configref/config_reference.h"
#include "fake_store.h"
#include "platform/kestrel_config_store.h"

namespace {

void prepareStore(uint8_t kind) {
  FakeStore &store = FakeStore::instance();
  store.reset();
  store.exists = kind % 6 != 0;
  auto &field = store.objects["c/a/b/"]["k"];
  if (kind % 6 == 1) field = 7L;
  if (kind % 6 == 2) field = 0.5;
  if (kind % 6 == 3) field = std::string("text");
  if (kind % 6 == 4) {
    store.at["GetObject"] = [] { throw KestrelConfigStore::ConfigStoreException("gone"); };
  }
  if (kind % 6 == 5) store.at["GetStore"] = [] { throw std::runtime_error("no more files"); };
}

template <typename Convert>
void convert(const YAML::Node &node, Convert to) {
  try {
    to(node, {{"numPCPUs", 8.0F}});
  } catch (const YAML::Exception &) {
    // A malformed reference; everything else that is thrown ends the run.
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  if (size == 0) return 0;
  prepareStore(data[0]);
  YAML::Node node;
  try {
    node = YAML::Load(std::string(reinterpret_cast<const char *>(data + 1), size - 1));
  } catch (const YAML::Exception &) {
    return 0;
  }
  convert(node, ConfigToFloat);
  convert(node, ConfigToBool);
  return 0;
}
