// SPDX-License-Identifier: Apache-2.0
// What a scheduler group may have, as the kernel's records hold it.
#pragma once

#include "platform/knob_records.h"

namespace Sched {

// Megabytes. -1: no limit, or not given.
using MemAllocation = KNOB_MemAllocation;

// Percent of one CPU. -1: no limit, or not given.
using CpuAllocation = KNOB_CpuAllocation;

}  // namespace Sched
