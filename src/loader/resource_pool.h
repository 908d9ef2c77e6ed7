// SPDX-License-Identifier: Apache-2.0
// One pool as a definition declares it.
#pragma once

#include <yaml-cpp/yaml.h>

#include <cstddef>
#include <string>
#include <vector>

#include "calc/variable_table.h"
#include "sched/allocation.h"

namespace Loader {

// Made whole or not at all, and read only from then on. No member is padded: the two records are
// the packed ones that the kernel is given.
struct ResourcePoolImpl {
  // Reads one item of a definition file, a mapping. Throws Loader::Exception at the node at
  // fault, the yaml library's errors, and whatever the conversion of a value throws.
  explicit ResourcePoolImpl(const YAML::Node &item);

  // The same with the facts of another machine; asks no kernel.
  ResourcePoolImpl(const YAML::Node &item, const Calc::VariableTable &facts);

  std::string name;  // the full group path; begins with "host/"
  bool isEnabled = true;
  Sched::MemAllocation mem;
  Sched::CpuAllocation cpu;
};

// The keys that a definition may have, in the order in which they are compared.
std::vector<std::string> poolKeys();

static_assert(offsetof(ResourcePoolImpl, isEnabled) == sizeof(std::string));
static_assert(offsetof(ResourcePoolImpl, mem) == sizeof(std::string) + 1);
static_assert(offsetof(ResourcePoolImpl, cpu) ==
              sizeof(std::string) + 1 + sizeof(Sched::MemAllocation));

}  // namespace Loader
