// SPDX-License-Identifier: Apache-2.0
// Any text as an expression. Short ones must mean the same as in the plain second reading.
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "calc/evaluator.h"
#include "naive_evaluator.h"

namespace {

// The plain reading has no bound on nesting; within this length it needs none.
constexpr size_t kLongestCompared = 1000;

const Calc::VariableTable kVariables = {
    {"x", 2.0F}, {"n", NAN}, {"z", -0.0F}, {"numPCPUs", 8.0F}, {"nucdefs.nux86_debug", 0.0F}};

[[noreturn]] void fail(const char *why) {
  std::fprintf(stderr, "%s\n", why);
  std::abort();
}

void check(bool holds, const char *why) {
  if (!holds) fail(why);
}

bool sameValue(float one, float other) {
  if (std::isnan(one) || std::isnan(other)) return std::isnan(one) && std::isnan(other);
  return std::memcmp(&one, &other, sizeof one) == 0;
}

Naive::Outcome evaluateReally(const std::string &text) {
  Naive::Outcome outcome;
  try {
    outcome.value = Calc::Evaluate(text, kVariables);
  } catch (const Calc::Exception &fault) {
    check(fault.position >= text.c_str() && fault.position <= text.c_str() + text.size(),
          "the position lies outside the text");
    outcome.failed = true;
    outcome.message = fault.what();
    outcome.position = static_cast<size_t>(fault.position - text.c_str());
  }
  return outcome;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  const std::string text(reinterpret_cast<const char *>(data), size);
  const Naive::Outcome actual = evaluateReally(text);
  if (text.size() > kLongestCompared) return 0;
  const Naive::Outcome expected = Naive::evaluate(text, kVariables);
  check(actual.failed == expected.failed, "only one of the readings fails");
  if (actual.failed) {
    check(actual.message == expected.message, "the messages differ");
    check(actual.position == expected.position, "the positions differ");
  } else {
    check(sameValue(actual.value, expected.value), "the values differ");
  }
  return 0;
}
