// SPDX-License-Identifier: Apache-2.0
// A second reading of the expression language, for comparison: plain, slow and without regard to
// the real one. It has no bound on nesting, so texts given to it must be short.
#pragma once

#include <cstddef>
#include <string>
#include <unordered_map>

namespace Naive {

using Variables = std::unordered_map<std::string, float>;

// What a text comes to: a value, or the message of a fault and its offset in the text.
struct Outcome {
  bool failed = false;
  float value = 0;
  std::string message;
  std::size_t position = 0;
};

// The text ends at its first NUL.
Outcome evaluate(const std::string &text, const Variables &variables);

}  // namespace Naive
