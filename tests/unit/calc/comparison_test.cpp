// SPDX-License-Identifier: Apache-2.0
// The evaluator against the plain reading of the same rules: on a million random texts and on
// every short text. Values must agree bit for bit, faults in message and position.
#include <gtest/gtest.h>

#include <chrono>
#include <cmath>
#include <cstring>
#include <limits>
#include <string>
#include <vector>

#include "calc/evaluator.h"
#include "naive_evaluator.h"
#include "random_text.h"

namespace {

Naive::Outcome evaluateReally(const std::string &text, const Calc::VariableTable &variables) {
  Naive::Outcome outcome;
  try {
    outcome.value = Calc::Evaluate(text, variables);
  } catch (const Calc::Exception &fault) {
    outcome.failed = true;
    outcome.message = fault.what();
    outcome.position = static_cast<std::size_t>(fault.position - text.c_str());
  }
  return outcome;
}

bool sameValue(float one, float other) {
  if (std::isnan(one) || std::isnan(other)) return std::isnan(one) && std::isnan(other);
  return std::memcmp(&one, &other, sizeof one) == 0;
}

bool same(const Naive::Outcome &one, const Naive::Outcome &other) {
  if (one.failed != other.failed) return false;
  if (!one.failed) return sameValue(one.value, other.value);
  return one.message == other.message && one.position == other.position;
}

std::string described(const Naive::Outcome &outcome) {
  if (!outcome.failed) return std::to_string(outcome.value);
  return outcome.message + " at offset " + std::to_string(outcome.position);
}

bool agree(const std::string &text, const Calc::VariableTable &variables) {
  const Naive::Outcome expected = Naive::evaluate(text, variables);
  const Naive::Outcome actual = evaluateReally(text, variables);
  if (same(expected, actual)) return true;
  ADD_FAILURE() << "'" << text << "': plain reading: " << described(expected)
                << "; evaluator: " << described(actual);
  return false;
}

const std::vector<Calc::VariableTable> &tables() {
  constexpr float kNaN = std::numeric_limits<float>::quiet_NaN();
  constexpr float kInfinity = std::numeric_limits<float>::infinity();
  static const std::vector<Calc::VariableTable> kTables = {
      {},
      {{"x", 2.0f}, {"y", -3.5f}, {"n", kNaN}, {"z", -0.0f}, {"a.b", 0.1f}},
      {{"x", 0.0f}, {"y", kInfinity}, {"n", 1e-45f}, {"z", 3e38f}, {"_", 4.0f}, {"e", 1.0f}},
      // Names that stand before words.
      {{"x", 1.0f}, {"min", 3.0f}, {"not", 0.0f}, {"True", 5.0f}, {"else", 6.0f}, {"nan", 7.0f}},
  };
  return kTables;
}

// Each of eight parts takes an eighth of the million, with a seed of its own.
class RandomTexts : public testing::TestWithParam<unsigned> {};

TEST_P(RandomTexts, MeanTheSameInBothReadings) {
  RandomText random(20240501u + GetParam());
  int differences = 0;
  for (int i = 0; i < 125000 && differences < 10; ++i) {
    const std::string text = random.next();
    const auto &variables = tables()[static_cast<std::size_t>(random.below(4))];
    if (!agree(text, variables)) ++differences;
  }
}

INSTANTIATE_TEST_SUITE_P(Comparison, RandomTexts, testing::Range(0u, 8u));

TEST(RandomTexts, AreGoodAndBrokenInFairShares) {
  RandomText random(1);
  int good = 0;
  constexpr int kTexts = 20000;
  for (int i = 0; i < kTexts; ++i) {
    if (!Naive::evaluate(random.next(), tables()[1]).failed) ++good;
  }
  EXPECT_GT(good, kTexts / 10);
  EXPECT_LT(good, kTexts * 9 / 10);
}

// Walks all sequences of `length` tokens; false when the time is over or too much differs.
class EveryText {
 public:
  EveryText(std::vector<std::string> alphabet, std::chrono::steady_clock::time_point end)
      : alphabet_(std::move(alphabet)), end_(end) {}

  bool compare(int length, const std::string &text = "") {
    if (length == 0) return compareOne(text);
    for (const std::string &token : alphabet_) {
      if (!compare(length - 1, text + token)) return false;
    }
    return true;
  }

  long compared() const { return compared_; }

 private:
  bool compareOne(const std::string &text) {
    if (!agree(text, tables()[1]) && ++differences_ == 10) return false;
    return ++compared_ % 1024 != 0 || std::chrono::steady_clock::now() < end_;
  }

  std::vector<std::string> alphabet_;
  std::chrono::steady_clock::time_point end_;
  long compared_ = 0;
  int differences_ = 0;
};

// Longer and longer texts, as far as the time goes, but every text of `atLeast` tokens.
void compareEveryTextOver(const std::vector<std::string> &alphabet, int atLeast) {
  using Clock = std::chrono::steady_clock;
  long compared = 0;
  for (int length = 0; length <= atLeast; ++length) {
    EveryText texts(alphabet, Clock::time_point::max());
    ASSERT_TRUE(texts.compare(length));
    compared += texts.compared();
  }
  EveryText more(alphabet, Clock::now() + std::chrono::seconds(5));
  more.compare(atLeast + 1);
  testing::Test::RecordProperty("texts", std::to_string(compared + more.compared()));
}

TEST(EveryShortText, OverWordsAndSignsMeansTheSameInBothReadings) {
  compareEveryTextOver({"1", "0", "x", " ", "+", "-", "*", "/", "(", ")", ",", "and", "or", "if",
                        "else", "not", "min", "ceil", "True"},
                       4);
}

TEST(EveryShortText, OfOperandsAndWordsMeansTheSameInBothReadings) {
  compareEveryTextOver({"0 ", "n ", "True ", "and ", "if ", "else ", "- ", "* ", "not "}, 6);
}

TEST(EveryShortText, OverLettersMeansTheSameInBothReadings) {
  compareEveryTextOver({"1", ".", "e", "x", "-", "+", " ", "(", ")", "o", "r"}, 5);
}

TEST(EveryShortText, InsideMinMeansTheSameInBothReadings) {
  compareEveryTextOver({"min(", "ceil(", "(", "1", "False", ",", ")", " ", "-", "not "}, 5);
}

}  // namespace
