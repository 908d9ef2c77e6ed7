// SPDX-License-Identifier: Apache-2.0
// Medians and quartiles, because on a busy machine the mean depends on the other processes.
#include "sample.h"

#include <algorithm>
#include <cmath>
#include <cstdio>

namespace Bench {

double Sample::quantile(double share) const {
  if (values_.empty()) {
    return std::nan("");
  }
  std::vector<double> sorted = values_;
  std::sort(sorted.begin(), sorted.end());
  const double place = share * static_cast<double>(sorted.size() - 1);
  const auto below = static_cast<std::size_t>(place);
  const std::size_t above = std::min(below + 1, sorted.size() - 1);
  const double fraction = place - static_cast<double>(below);
  return sorted[below] + (sorted[above] - sorted[below]) * fraction;
}

std::string Sample::text(int decimals) const {
  char buffer[128];
  std::snprintf(buffer, sizeof buffer, "%.*f (%.*f to %.*f)", decimals, median(), decimals,
                quantile(0.25), decimals, quantile(0.75));
  return buffer;
}

void printGoal(const std::string &what, double value, bool met, const std::string &goal) {
  std::printf("  %-46s %9.2f   goal %-14s %s\n", what.c_str(), value, goal.c_str(),
              met ? "met" : "MISSED");
}

}  // namespace Bench
