// SPDX-License-Identifier: Apache-2.0
// Where the value of a definition's key comes from.
#pragma once

#include <string>
#include <vector>

#include "plan_check/definition_check.h"
#include "plan_check/machine.h"

namespace Plan {

struct Explanation {
  std::string pool;
  std::string key;
  std::string value;               // as poolctl uses it
  std::string origin;              // "= EXPRESSION" with all brackets, or where the value is from
  std::string file;                // empty for a default
  Place place;                     // of the key
  std::vector<std::string> steps;  // each part's value, innermost first
};

// Every key of the pool, or that key alone, in the order of a definition. MACHINENAME: where the
// facts are from, as in "physKB = 10485760 (this kernel)".
std::vector<Explanation> explain(const DeclaredPool &pool, const std::string &key,
                                 const Machine &machine, const std::string &machineName);

std::string explanationText(const std::vector<Explanation> &explanations);
std::string explanationJson(const std::vector<Explanation> &explanations);

}  // namespace Plan
