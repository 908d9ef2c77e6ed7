// SPDX-License-Identifier: Apache-2.0
// What the kernel's control files must say of a pool, worked out from the pool's numbers alone.
#pragma once

#include <cstdint>
#include <map>
#include <string>

namespace Uml {

// The numbers of one line of "poolctl list -v", as a definition gives them; -1 where it says "-".
struct PoolNumbers {
  bool enabled = true;
  int64_t memMin = 0, memMax = -1;
  int64_t cpuMin = 0, cpuMax = -1, cpuShares = 1000;
};

using Pools = std::map<std::string, PoolNumbers>;  // by name

// Reads the output of "poolctl list -v".
Pools parseList(const std::string &csv);

// "memory.min: 67108864" and so on, one a line, for each enabled pool and every group above one.
std::map<std::string, std::string> expectedFiles(const Pools &pools, int64_t cpus);

// The same lines as the kernel has them.
std::string actualFiles(const std::string &group);

}  // namespace Uml
