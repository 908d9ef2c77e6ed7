// SPDX-License-Identifier: Apache-2.0
// Reading and checking what a call wants to change of an allocation.
#pragma once

#include <string_view>
#include <vector>

#include "knob/kernel.h"

namespace Knob {

// The change that `key=decimal` entries ask for: any of min, max, minLimit and shares, each at most
// once and at least one of them. Memory takes 64-bit numbers, CPU 32-bit ones. Throws KernelError
// (bad parameter).
AllocationChange parseAllocationChange(Resource resource,
                                       const std::vector<std::string_view> &entries);

// The allocation after the change, checked whole: a min of -1 counts as 0; -1 is no limit in max
// and minLimit; shares are -2, -3, -4 or a number from 0 up; min is at most max. Throws KernelError
// (bad parameter).
Allocation changedAllocation(const Allocation &current, const AllocationChange &change);

}  // namespace Knob
