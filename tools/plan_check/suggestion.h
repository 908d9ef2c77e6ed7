// SPDX-License-Identifier: Apache-2.0
// Guesses which of several known words was meant.
#pragma once

#include <string>
#include <vector>

namespace Plan {

// The candidate that is most like the word, or an empty text when none is close. Letters that
// differ only in case count as equal.
std::string closest(const std::string &word, const std::vector<std::string> &candidates);

// "a, b, c".
std::string joined(const std::vector<std::string> &words);

}  // namespace Plan
