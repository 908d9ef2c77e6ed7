// SPDX-License-Identifier: Apache-2.0
// What libkestrelconfig exports: the public classes on top of the store that the configuration
// names. A process keeps the store that it opened for as long as the configuration stays the same.
#include <unistd.h>

#include <mutex>
#include <utility>

#include "kestrel/open.h"
#include "platform/kestrel_config_store.h"

namespace KestrelConfigStore {

const std::string sGlobalNamespace = "global";

}  // namespace KestrelConfigStore

namespace Kestrel {

namespace {

using KestrelConfigStore::ConfigStore;
using KestrelConfigStore::InvalidTypeException;
using KestrelConfigStore::StoreObject;

// The fields of one object at the moment of its lookup.
class Snapshot : public StoreObject {
 public:
  explicit Snapshot(Fields fields) : fields_(std::move(fields)) {}

  bool GetValue(const char *field, long *value) const override {
    static_assert(sizeof(long) == sizeof(int64_t));
    const auto found = fields_.find(field);
    if (found == fields_.end()) return false;
    const auto *integer = std::get_if<int64_t>(&found->second);
    if (integer == nullptr) refuse(*found, "an integer");
    *value = *integer;
    return true;
  }

  bool GetValue(const char *field, double *value) const override {
    const auto found = fields_.find(field);
    if (found == fields_.end()) return false;
    if (const auto *integer = std::get_if<int64_t>(&found->second)) {
      *value = static_cast<double>(*integer);
    } else if (const auto *real = std::get_if<double>(&found->second)) {
      *value = *real;
    } else {
      refuse(*found, "a number");
    }
    return true;
  }

 private:
  [[noreturn]] static void refuse(const Fields::value_type &field, const char *wanted) {
    throw InvalidTypeException("field \"" + field.first + "\" is of type " +
                               std::string(typeName(typeOf(field.second))) + ", not " + wanted);
  }

  Fields fields_;
};

class Store : public ConfigStore {
 public:
  explicit Store(std::shared_ptr<Backend> backend) : backend_(std::move(backend)) {}

  std::shared_ptr<StoreObject> GetObject(const ObjectId &id) override {
    auto fields = backend_->read(id);
    if (!fields) return nullptr;
    return std::make_shared<Snapshot>(std::move(*fields));
  }

 private:
  std::shared_ptr<Backend> backend_;
};

// The store that this process has open. A child process leaves its parent's alone, for neither
// SQLite nor a connection to a server can be shared with it: hence never released, only put aside.
struct Opened {
  pid_t process = 0;
  Configuration configuration;
  std::shared_ptr<Backend> backend;
  std::shared_ptr<Opened> parents;
};

std::shared_ptr<Backend> openedBackend() {
  static std::mutex mutex;
  // Never destroyed: exit handlers may still read, and a child's exit must not close what is its
  // parent's.
  static auto &opened = *new std::shared_ptr<Opened>(std::make_shared<Opened>());
  const std::lock_guard<std::mutex> lock(mutex);

  Configuration configuration = readConfiguration();
  if (opened->backend && opened->process != getpid()) {
    auto own = std::make_shared<Opened>();
    own->parents = std::exchange(opened, own);
  }
  const bool same = opened->backend && opened->configuration == configuration;
  if (same && opened->backend->current()) return opened->backend;
  opened->backend.reset();
  opened->backend = openBackend(configuration, Access::kRead);
  opened->configuration = std::move(configuration);
  opened->process = getpid();
  return opened->backend;
}

}  // namespace

}  // namespace Kestrel

namespace KestrelConfigStore {

std::shared_ptr<ConfigStore> ConfigStore::GetStore(const std::string &nameSpace) {
  if (nameSpace != sGlobalNamespace) return nullptr;
  auto backend = Kestrel::openedBackend();
  if (!backend) return nullptr;
  return std::make_shared<Kestrel::Store>(std::move(backend));
}

}  // namespace KestrelConfigStore
