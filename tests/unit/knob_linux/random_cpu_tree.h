// SPDX-License-Identifier: Apache-2.0
// Random trees of groups for the tests of CPU weights. The same number always makes the same tree.
#pragma once

#include <cstdint>
#include <random>

#include "cpu_tree.h"

namespace Knob::Linux {

class Random {
 public:
  explicit Random(uint64_t seed) : engine_(seed) {}
  int64_t from(int64_t least, int64_t most) {
    return std::uniform_int_distribution<int64_t>(least, most)(engine_);
  }
  bool oneIn(int64_t n) { return from(1, n) == 1; }
  double fraction() { return std::uniform_real_distribution<double>(0, 1)(engine_); }

 private:
  std::mt19937_64 engine_;
};

// The weight of any shares: often one of the three levels.
int64_t randomShareWeight(Random &random);

enum class Reservations {
  kSpread,        // over any number of the groups
  kConcentrated,  // in one to four groups without children
};

// To four levels below host, up to 50 children a group, one to six groups of other programs beside
// host with weights from 1 to 10,000, and up to 90 percent of the machine reserved. Weighed.
CpuTree randomCpuTree(Random &random, Reservations reservations);

// Lets other programs have weights beside which the reservations can be kept, and weighs all.
void weighBesideOthers(CpuTree &tree, Random &random);

}  // namespace Knob::Linux
