// SPDX-License-Identifier: Apache-2.0
// Stands in for the store's client library under the names that the library exports.
#include "fake_store.h"

#include <memory>
#include <type_traits>

#include "platform/kestrel_config_store.h"

namespace {

using KestrelConfigStore::ConfigStore;
using KestrelConfigStore::ConfigStoreObjectId;
using KestrelConfigStore::InvalidTypeException;
using KestrelConfigStore::StoreObject;

class FakeObject : public StoreObject {
 public:
  explicit FakeObject(std::map<std::string, FakeStore::Field> fields)
      : fields_(std::move(fields)) {}

  bool GetValue(const char *field, long *value) const override {
    FakeStore::instance().called("GetValue long", field);
    return read(field, value);
  }

  bool GetValue(const char *field, double *value) const override {
    FakeStore::instance().called("GetValue double", field);
    return read(field, value);
  }

 private:
  template <typename Target>
  bool read(const char *field, Target *value) const {
    const auto found = fields_.find(field);
    if (found == fields_.end()) return false;
    std::visit([value](const auto &held) { give(held, value); }, found->second);
    return true;
  }

  // An integer answers both reads, a real number only its own.
  template <typename Held, typename Target>
  static void give(const Held &held, Target *value) {
    if constexpr (std::is_same_v<Held, Target> || std::is_same_v<Held, long>) {
      *value = static_cast<Target>(held);
    } else {
      throw InvalidTypeException("another type");
    }
  }

  std::map<std::string, FakeStore::Field> fields_;
};

class FakeConfigStore : public ConfigStore {
 public:
  std::shared_ptr<StoreObject> GetObject(const ConfigStoreObjectId &id) override {
    const std::string path = id.key + "/" + id.component + "/" + id.group + "/" + id.extra;
    FakeStore &store = FakeStore::instance();
    store.called("GetObject", path);
    const auto found = store.objects.find(path);
    return found == store.objects.end() ? nullptr : std::make_shared<FakeObject>(found->second);
  }
};

}  // namespace

FakeStore &FakeStore::instance() {
  static FakeStore store;
  return store;
}

void FakeStore::called(const std::string &name, const std::string &argument) {
  calls.push_back(name + " " + argument);
  const auto action = at.find(name);
  if (action != at.end()) action->second();
}

const std::string KestrelConfigStore::sGlobalNamespace = "global";

std::shared_ptr<ConfigStore> ConfigStore::GetStore(const std::string &nameSpace) {
  FakeStore::instance().called("GetStore", nameSpace);
  return FakeStore::instance().exists ? std::make_shared<FakeConfigStore>() : nullptr;
}
