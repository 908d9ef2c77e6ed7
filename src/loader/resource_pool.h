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

// The constructor sets every member or throws. Commands read the members; unload also replaces mem
// and cpu by the settings of the live group. The two records are the packed ones of the kernel's
// interface, so the members have no padding between them.
struct ResourcePoolImpl {
  // Reads one item of a definition file, a mapping. Throws Loader::Exception with the place of the
  // fault, the yaml library's errors, and any exception from the conversion of a value.
  explicit ResourcePoolImpl(const YAML::Node &item);

  // The same with the facts of another machine, without a call to the kernel.
  ResourcePoolImpl(const YAML::Node &item, const Calc::VariableTable &facts);

  std::string name;  // the path of the group; begins with "host/"
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
