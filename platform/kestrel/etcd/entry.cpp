// SPDX-License-Identifier: Apache-2.0
// The one name that the module exports.
#include <memory>

#include "kestrel/etcd/etcd_backend.h"
#include "kestrel/module.h"

extern "C" __attribute__((visibility("default"))) void kestrelModuleOpen2(
    const Kestrel::Configuration &configuration, std::shared_ptr<Kestrel::Backend> *result) {
  *result = Kestrel::Etcd::openEtcdBackend(configuration);
}

static_assert(std::is_same_v<decltype(kestrelModuleOpen2), Kestrel::ModuleEntry>);
