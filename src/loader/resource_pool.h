// SPDX-License-Identifier: Apache-2.0
// One pool as a definition declares it.
#pragma once

#include <yaml-cpp/yaml.h>

#include <cstddef>
#include <string>

#include "sched/allocation.h"

namespace Loader {

// Made whole or not at all, and read only from then on. No member is padded: the two records are
// the packed ones that the kernel is given.
struct ResourcePoolImpl {
  // Reads one item of a definition file, a mapping. Throws Loader::Exception at the node at
  // fault, the yaml library's errors, and whatever the conversion of a value throws.
  explicit ResourcePoolImpl(const YAML::Node &item);

  std::string name;  // the full group path; begins with "host/"
  bool isEnabled = true;
  Sched::MemAllocation mem;
  Sched::CpuAllocation cpu;
};

static_assert(offsetof(ResourcePoolImpl, isEnabled) == sizeof(std::string));
static_assert(offsetof(ResourcePoolImpl, mem) == sizeof(std::string) + 1);
static_assert(offsetof(ResourcePoolImpl, cpu) ==
              sizeof(std::string) + 1 + sizeof(Sched::MemAllocation));

}  // namespace Loader
