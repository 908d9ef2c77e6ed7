// SPDX-License-Identifier: Apache-2.0
// Repeated measurements of one quantity, and how they are printed.
#pragma once

#include <string>
#include <vector>

namespace Bench {

class Sample {
 public:
  void add(double value) { values_.push_back(value); }
  double median() const { return quantile(0.5); }

  // The value that the given share of the measurements does not exceed.
  double quantile(double share) const;

  // "MEDIAN (LOW to HIGH)": the median and the quartiles, with the given number of decimals.
  std::string text(int decimals) const;

 private:
  std::vector<double> values_;
};

// Prints what was measured against its goal: "met" or "MISSED".
void printGoal(const std::string &what, double value, bool met, const std::string &goal);

}  // namespace Bench
