// SPDX-License-Identifier: Apache-2.0
// What the files of a group hold for its allocations, and what allocations its files tell.
#pragma once

#include <array>
#include <string>

#include "knob/linux/control_file.h"
#include "knob/linux/groups.h"
#include "knob/linux/record.h"

namespace Knob::Linux {

// What a control file holds.
struct Value {
  Control control;
  std::string text;
};

// The two files of one resource; the first is the one that the reservation shows in.
using Values = std::array<Value, 2>;

// cpus: of the machine.
Values valuesOf(Resource resource, const ResourceState &books, uint32_t cpus);

// The nearest that our settings can express. No file tells a CPU minimum. Throws KernelError.
Record readFiles(const Group &group);

}  // namespace Knob::Linux
