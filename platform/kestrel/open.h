// SPDX-License-Identifier: Apache-2.0
// Opens the store that a configuration names, and inspects it.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "kestrel/backend.h"
#include "kestrel/configuration.h"

namespace Kestrel {

// kCreate makes a missing store; the others return null for it.
enum class Access { kRead, kChange, kCreate };

// Null: the store does not exist. Throws a ConfigStoreException for a store that cannot be used.
std::shared_ptr<Backend> openBackend(const Configuration &configuration, Access access);

// The same, with the configuration file read now.
std::shared_ptr<Backend> openBackend(Access access);

enum class Condition {
  kUsable,
  kLimited,  // it can be read, but accepts no change, or its values may be old
  kMissing,
  kUnusable,
};

struct Report {
  Condition condition = Condition::kUnusable;
  std::vector<Detail> details;  // in the order in which people read them
  std::string problem;          // why it is not usable; empty: it is
};

// Inspects the configuration and the store. What is wrong with them is in the report, not thrown.
Report inspect();

}  // namespace Kestrel
