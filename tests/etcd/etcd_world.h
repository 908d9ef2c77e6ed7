// SPDX-License-Identifier: Apache-2.0
// What the tests of the etcd store have in common: names of objects, stores, and what is caught.
#pragma once

#include <gtest/gtest.h>

#include <chrono>
#include <functional>
#include <memory>
#include <string>

#include "etcd_server.h"
#include "kestrel/backend.h"
#include "kestrel/etcd/etcd_backend.h"
#include "temp_folder.h"

namespace Test {

inline Kestrel::ObjectId object(std::string component, std::string group, std::string key,
                                std::string extra = "") {
  return {std::move(key), std::move(component), std::move(group), std::move(extra)};
}

// The message of the ConfigStoreException that an action throws; "" when it throws none. Any other
// exception escapes.
inline std::string refusalOf(const std::function<void()> &action) {
  try {
    action();
    return "";
  } catch (const KestrelConfigStore::ConfigStoreException &error) {
    return error.what();
  }
}

inline std::chrono::milliseconds timeOf(const std::function<void()> &action) {
  const auto start = std::chrono::steady_clock::now();
  action();
  return std::chrono::ceil<std::chrono::milliseconds>(std::chrono::steady_clock::now() - start);
}

// A server, or a cluster, in a folder of the test's own.
class ServersFixture : public testing::Test {
 protected:
  explicit ServersFixture(int count, const EtcdOptions &options = {})
      : etcd_(folder_.path(), count, options) {}

  // A new run, as every process has one.
  std::shared_ptr<Kestrel::Backend> store() const {
    return Kestrel::Etcd::openEtcdBackend(etcd_.configuration());
  }
  void put(const std::string &key, const std::string &value) const {
    etcd_.etcdctl({"put", "/kestrel/global/" + key}, value);
  }
  std::string rawValue(const std::string &key) const {
    const std::string text = etcd_.etcdctl({"get", "--print-value-only", "/kestrel/global/" + key});
    return text.empty() ? text : text.substr(0, text.size() - 1);
  }

  TempFolder folder_;
  Etcd etcd_;
};

}  // namespace Test
