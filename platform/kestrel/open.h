// SPDX-License-Identifier: Apache-2.0
// The way from a configuration to the store that it names.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "kestrel/backend.h"
#include "kestrel/configuration.h"

namespace Kestrel {

// kCreate makes the store where there is none; the others leave it at that.
enum class Access { kRead, kChange, kCreate };

// Empty: there is no store. Throws a ConfigStoreException when there is one that cannot be used.
std::shared_ptr<Backend> openBackend(const Configuration &configuration, Access access);

// The same, for what the configuration file says now.
std::shared_ptr<Backend> openBackend(Access access);

enum class Condition { kUsable, kMissing, kUnusable };

struct Report {
  Condition condition = Condition::kUnusable;
  std::vector<Detail> details;  // in the order in which people read them
  std::string problem;          // why it cannot be used; empty when it can
};

// Looks at the configuration and at the store, and never throws for what it finds wrong there.
Report inspect();

}  // namespace Kestrel
