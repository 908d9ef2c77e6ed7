// SPDX-License-Identifier: Apache-2.0
// Loadable modules: a store engine that costs a host nothing unless its configuration names it.
#pragma once

#include <memory>

#include "kestrel/backend.h"
#include "kestrel/configuration.h"

namespace Kestrel {

// What a module exports under the name kModuleEntry, with C linkage: puts its backend into *RESULT,
// or throws a ConfigStoreException. Opening asks no server. The number in the name is raised with
// every change of Backend or Configuration.
using ModuleEntry = void(const Configuration &configuration, std::shared_ptr<Backend> *result);
inline constexpr const char *kModuleEntry = "kestrelModuleOpen2";

// Loads a module by its file name, as the dynamic linker finds it, and opens its backend. ENGINE is
// the engine's name, for messages. Throws a ConfigStoreException when this build has no such
// module.
std::shared_ptr<Backend> openModule(const char *fileName, const char *engine,
                                    const Configuration &configuration);

}  // namespace Kestrel
