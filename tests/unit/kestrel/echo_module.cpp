// SPDX-License-Identifier: Apache-2.0
// A module for the tests: each object has one field, the configuration's path.
#include "kestrel/errors.h"
#include "kestrel/module.h"

namespace {

class Echo : public Kestrel::Backend {
 public:
  explicit Echo(const Kestrel::Configuration &configuration) : path_(configuration.path) {}

  std::optional<Kestrel::Fields> read(const Kestrel::ObjectId &) override {
    return Kestrel::Fields{{"path", path_}};
  }
  Kestrel::Listing list(const Kestrel::Selection &) override { return {}; }
  void setField(const Kestrel::ObjectId &, const std::string &, const Kestrel::Value &) override {
    refuse();
  }
  bool removeField(const Kestrel::ObjectId &, const std::string &) override { refuse(); }
  bool removeObject(const Kestrel::ObjectId &) override { refuse(); }
  void replace(const std::vector<Kestrel::StoredObject> &) override { refuse(); }
  bool move(const Kestrel::ObjectId &, const std::string &, const std::string &) override {
    refuse();
  }
  Kestrel::Health health() override { return {}; }
  std::vector<Kestrel::LayerFields> layers(const Kestrel::ObjectId &) override { return {}; }
  Kestrel::RunSource source() const override { return {}; }
  bool current() override { return true; }

 private:
  [[noreturn]] static void refuse() { throw Kestrel::storeError("echo", "refused"); }

  std::string path_;
};

}  // namespace

extern "C" void kestrelModuleOpen2(const Kestrel::Configuration &configuration,
                                   std::shared_ptr<Kestrel::Backend> *result) {
  *result = std::make_shared<Echo>(configuration);
}
