// SPDX-License-Identifier: Apache-2.0
// What has to be done so that the kernel's groups match the definitions, in an order in which each
// step fits: first what makes room, then what needs it; parents before their children.
#pragma once

#include <string>
#include <vector>

#include "plan_check/comparison.h"
#include "plan_check/machine.h"

namespace Plan {

struct Step {
  enum class Act {
    kDelete,  // an empty group
    kCreate,  // a group, with memory and CPU
    kSet,     // the settings of one resource
  };

  Act act = Act::kSet;
  std::string path;
  Knob::Resource resource = Knob::Resource::kMemory;  // of kSet
  Knob::AllocationChange memory, cpu;                 // of kCreate both, of kSet that one
  std::vector<Setting> settings;                      // of kSet: what changes
};

// A step as people read it: "set host/opt/web: memMax 128 -> 160".
std::string stepText(const Step &step);

// Something that cannot be done, and why.
struct Obstacle {
  std::string path;
  std::string reason;
};

struct StepList {
  std::vector<Step> steps;
  std::vector<Obstacle> obstacles;
};

enum class Prune { kNo, kEmptyGroups };

// prune: whether groups that no definition declares are deleted; those with processes, or with
// groups that stay, are obstacles. The machine must be known.
StepList planSteps(const std::vector<DeclaredPool> &pools, const Machine &machine,
                   const std::vector<KernelGroup> &groups, Prune prune);

}  // namespace Plan
