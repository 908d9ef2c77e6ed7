// SPDX-License-Identifier: Apache-2.0
// A module is never unloaded: the code of its backends and of exceptions under way is in it.
#include "kestrel/module.h"

#include <dlfcn.h>

#include <string>

#include "kestrel/errors.h"

namespace Kestrel {

namespace {

std::string linkerText() {
  const char *text = dlerror();
  return text == nullptr ? "no reason given" : text;
}

}  // namespace

std::shared_ptr<Backend> openModule(const char *fileName, const char *engine,
                                    const Configuration &configuration) {
  const std::string module = std::string(engine) + " module";
  void *library = dlopen(fileName, RTLD_LAZY | RTLD_LOCAL | RTLD_NODELETE);
  if (library == nullptr) {
    throw storeError(configuration.file, "store: this build has no " + module, linkerText());
  }
  void *entry = dlsym(library, kModuleEntry);
  if (entry == nullptr) {
    throw storeError(configuration.file, "store: the " + module + " is of another version",
                     linkerText());
  }
  std::shared_ptr<Backend> backend;
  reinterpret_cast<ModuleEntry *>(entry)(configuration, &backend);
  return backend;
}

}  // namespace Kestrel
