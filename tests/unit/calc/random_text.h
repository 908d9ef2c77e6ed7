// SPDX-License-Identifier: Apache-2.0
// Makes expression texts at random: from the grammar, broken on purpose, or of any letters.
#pragma once

#include <random>
#include <string>

class RandomText {
 public:
  explicit RandomText(unsigned seed) : engine_(seed) {}

  // One in three keeps to the grammar, one in three is such a text with some letters changed, the
  // rest is tokens or letters in any order.
  std::string next();

  // A number below `limit`.
  int below(int limit);

 private:
  std::string expression(int depth);
  std::string operand(int depth);
  std::string mutated(std::string text);
  std::string anyTokens();
  std::string blanks();
  const char *token();

  std::mt19937 engine_;
};
