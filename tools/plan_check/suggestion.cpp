// SPDX-License-Identifier: Apache-2.0
// Likeness is the number of letters to insert, delete, replace or swap.
#include "plan_check/suggestion.h"

#include <algorithm>
#include <cctype>

namespace Plan {
namespace {

// A longer word is compared with nothing: it costs time in the square of its length.
constexpr size_t kMaxLength = 64;

std::string lower(std::string text) {
  for (char &c : text) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return text;
}

size_t distance(const std::string &a, const std::string &b) {
  std::vector<std::vector<size_t>> rows(a.size() + 1, std::vector<size_t>(b.size() + 1));
  for (size_t i = 0; i <= a.size(); ++i) {
    for (size_t j = 0; j <= b.size(); ++j) {
      if (i == 0 || j == 0) {
        rows[i][j] = i + j;
        continue;
      }
      const size_t replaced = rows[i - 1][j - 1] + (a[i - 1] == b[j - 1] ? 0 : 1);
      rows[i][j] = std::min({rows[i - 1][j] + 1, rows[i][j - 1] + 1, replaced});
      const bool swapped = i > 1 && j > 1 && a[i - 1] == b[j - 2] && a[i - 2] == b[j - 1];
      if (swapped) rows[i][j] = std::min(rows[i][j], rows[i - 2][j - 2] + 1);
    }
  }
  return rows[a.size()][b.size()];
}

}  // namespace

std::string closest(const std::string &word, const std::vector<std::string> &candidates) {
  if (word.size() > kMaxLength) return {};
  std::string best;
  size_t least = std::max<size_t>(1, word.size() / 3) + 1;
  for (const std::string &candidate : candidates) {
    const size_t found = distance(lower(word), lower(candidate));
    if (found < least) {
      least = found;
      best = candidate;
    }
  }
  return best;
}

std::string joined(const std::vector<std::string> &words) {
  std::string text;
  for (const std::string &word : words) text += (text.empty() ? "" : ", ") + word;
  return text;
}

}  // namespace Plan
