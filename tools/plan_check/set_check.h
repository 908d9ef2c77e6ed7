// SPDX-License-Identifier: Apache-2.0
// The pools of all files together, as a load would make them.
#pragma once

#include <optional>
#include <vector>

#include "plan_check/definition_check.h"
#include "plan_check/finding.h"
#include "plan_check/machine.h"
#include "plan_check/pool_tree.h"

namespace Plan {

// What a definition asks for, as load and enable ask for it.
Knob::AllocationChange memoryChange(const Loader::ResourcePoolImpl &pool);
Knob::AllocationChange cpuChange(const Loader::ResourcePoolImpl &pool);

// The pools in the order in which load makes them.
std::vector<const DeclaredPool *> inLoadOrder(const std::vector<DeclaredPool> &pools);

// What load would refuse, and what is odd about the pools beside one another. GROUPS: those of the
// kernel, or nothing when it is not known which groups there are; then no parent is missed. Values
// are judged only when the machine is known.
Findings checkSet(const std::vector<DeclaredPool> &pools, const Machine &machine,
                  const std::optional<std::vector<KernelGroup>> &groups);

// Only what a machine that has just started would find: beside the declared pools there are the
// groups that no definition declares.
Findings checkSetAfterStart(const std::vector<DeclaredPool> &pools, const Machine &machine,
                            const std::vector<KernelGroup> &groups);

}  // namespace Plan
