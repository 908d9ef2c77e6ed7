// SPDX-License-Identifier: Apache-2.0
// The store in an etcd cluster: an object is a key, and its fields are the JSON object that is the
// key's value.
//
// A run, which is the life of one backend, sees one revision: that of its first lookup, and after a
// change of its own that of the change. When the cluster no longer has that revision the store is
// gone for the run: values of two moments are never mixed.
#pragma once

#include <memory>

#include "kestrel/backend.h"
#include "kestrel/configuration.h"

namespace Kestrel::Etcd {

// Asks no server. Throws a ConfigStoreException when the settings cannot be used.
std::shared_ptr<Backend> openEtcdBackend(const Configuration &configuration);

}  // namespace Kestrel::Etcd
