// SPDX-License-Identifier: Apache-2.0
// Makes the steps of a plan on a kernel.
#pragma once

#include <chrono>
#include <functional>
#include <string>
#include <vector>

#include "knob/kernel.h"
#include "poolctl_plan/steps.h"

namespace Plan {

// What became of a step.
struct Outcome {
  Step step;
  bool isDone = false;
  std::string reason;  // why it is not done
};

// Makes each step, and goes on with the others when one fails. A step that fails leaves its group
// as it was: each setting is one call of the kernel, and a new group that cannot be set is deleted
// again. Steps that are refused because something is busy or has no room are tried again until
// WAIT is over, and as long as others succeed. The outcomes are in the order of the steps.
std::vector<Outcome> execute(const std::vector<Step> &steps, Knob::Kernel &kernel,
                             std::chrono::seconds wait,
                             const std::function<void(const Outcome &)> &report);

}  // namespace Plan
