// SPDX-License-Identifier: Apache-2.0
// The processes of this machine, as /proc shows them. A process that ends meanwhile is treated as
// one that does not exist.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace Platform {

// When a living process began, in clock ticks since the machine did: together with its id this
// identifies one process for ever. Nothing for a process that does not exist or is a zombie.
std::optional<int64_t> processStart(int64_t pid);

// The resident memory of a process; 0 when it does not exist.
uint64_t residentBytes(int64_t pid);

// The name of a process's program, without control characters; empty when it does not exist.
std::string processName(int64_t pid);

}  // namespace Platform
