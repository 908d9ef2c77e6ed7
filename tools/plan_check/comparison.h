// SPDX-License-Identifier: Apache-2.0
// Definitions beside the groups of a kernel.
#pragma once

#include <string>
#include <vector>

#include "knob/kernel.h"
#include "plan_check/definition_check.h"
#include "plan_check/pool_tree.h"

namespace Plan {

struct Difference {
  enum class Kind {
    kMissing,      // declared and enabled; the kernel has no such group
    kNotDeclared,  // the kernel has the group; no definition declares it
    kHalfMade,     // a load ended before the group had its settings
    kValue,        // one setting differs
    kFiles,        // the control files differ from what the kernel has recorded
  };

  Kind kind = Kind::kValue;
  std::string path;
  std::string key;       // of kValue: as in a definition
  int64_t declared = 0;  // of kValue
  int64_t kernel = 0;    // of kValue
  std::string text;      // of kHalfMade and kFiles: what is so
};

// The word for a kind, such as "half made".
const char *nameOf(Difference::Kind kind);

// A setting that differs, of one resource.
struct Setting {
  std::string key;
  int64_t declared = 0;
  int64_t kernel = 0;
};

// The settings of the resource in which the group is not as the definition wants it. A minimum of
// -1 counts as 0, and shares that are not given are not compared.
std::vector<Setting> differingSettings(const Loader::ResourcePoolImpl &pool,
                                       const Knob::GroupView &group, Knob::Resource resource);

enum class Undeclared { kReport, kLeaveOut };

// By path. Pools that are not enabled are not compared; the first of two pools of one name counts.
std::vector<Difference> compare(const std::vector<DeclaredPool> &pools,
                                const std::vector<KernelGroup> &groups, Undeclared undeclared);

// A table for people; empty when nothing differs.
std::string differenceTable(const std::vector<Difference> &differences);

// One JSON document of docs/poolctl-plan.schema.json.
std::string differenceJson(const std::vector<Difference> &differences);

}  // namespace Plan
