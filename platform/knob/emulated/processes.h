// SPDX-License-Identifier: Apache-2.0
// The processes of this machine, as far as membership needs them.
#pragma once

#include <cstdint>
#include <optional>

namespace Knob {

// When a living process began, in clock ticks since the machine did: together with its id this
// names one process for good. Nothing for a dead one, a zombie included.
std::optional<int64_t> processStart(int64_t pid);

// The memory that a process has resident; 0 when it is gone.
uint64_t residentBytes(int64_t pid);

}  // namespace Knob
