// SPDX-License-Identifier: Apache-2.0
// Values that lead into themselves, or into ever more values, through aliases: they end with an
// error that has a place, and soon.
#include <gtest/gtest.h>

#include <string>

#include "calc/tagged_value.h"
#include "fake_store.h"
#include "yaml_support.h"

namespace {

void expectRefused(const std::string &text, const std::string &message = kTooDeep) {
  FakeStore::instance().reset();
  const YAML::Node node = yaml(text);
  expectErrorAtSomePlace([&] { NodeToFloat(node, {}); }, message);
  expectErrorAtSomePlace([&] { NodeToBool(node, {}); }, message);
}

// LEVELS mappings, one in the other, around a plain value.
std::string nestedMappings(int levels) {
  std::string text = "3";
  for (int i = 0; i < levels; ++i) text = "!calc {x: " + text + ", =: x}";
  return text;
}

// One mapping of COUNT plain definitions.
std::string flatMapping(int count) {
  std::string text = "!calc\n";
  for (int i = 0; i < count; ++i) text += "d: 3\n";
  return text + "=: d\n";
}

TEST(NestedValue, CalcMappingThatHoldsItselfIsRefused) {
  expectRefused("&a !calc {x: *a, =: 1}");
}

TEST(NestedValue, DefaultThatIsItsOwnReferenceIsRefused) {
  expectRefused("&a !config {object: [a, b, c], key: k, default: *a}");
}

TEST(NestedValue, CircleOfTwoIsRefused) {
  expectRefused("&a !calc {x: !config {object: [a, b, c], key: k, default: *a}, =: x}");
  expectRefused("&a !config {object: [a, b, c], key: k, default: !calc {x: *a, =: x}}");
}

TEST(NestedValue, HoldingItselfTwiceIsRefused) {
  expectRefused("&a !calc {x: *a, y: *a, =: 1}");
  expectRefused("&a !config {object: [a, b, c], key: k, default: *a, default: *a}");
}

TEST(NestedValue, DoublingThirtyTimesIsRefused) {
  std::string text = "!calc\nx0: &x0 !calc {v: 1, =: v}\n";
  for (int i = 1; i <= 30; ++i) {
    const std::string before = "*x" + std::to_string(i - 1);
    const std::string name = "x" + std::to_string(i);
    text += name + ": &" + name + " !calc {v: " + before + ", w: " + before + ", =: v}\n";
  }
  expectRefused(text + "=: 1\n", kTooMany);
}

TEST(NestedValue, DoublingDefaultsThirtyTimesIsRefused) {
  std::string text = "!calc\nx0: &x0 1\n";
  for (int i = 1; i <= 30; ++i) {
    const std::string before = "*x" + std::to_string(i - 1);
    const std::string name = "x" + std::to_string(i);
    text += name + ": &" + name + " !config {object: [a, b, c], key: k, default: " + before +
            ", default: " + before + "}\n";
  }
  expectRefused(text + "=: 1\n", kTooMany);
}

TEST(NestedValue, AliasThatIsTheResultTextIsNoCircle) {
  expectErrorAnywhere<YAML::TypedBadConversion<std::string>>(
      [] { NodeToFloat(yaml("&a !calc {=: *a}"), {}); }, "bad conversion");
}

TEST(NestedValue, DozensOfLevelsAreFine) {
  EXPECT_EQ(3.0f, NodeToFloat(yaml(nestedMappings(40)), {}));
  EXPECT_TRUE(NodeToBool(yaml(nestedMappings(40)), {}));
}

// By way of aliases: the yaml library does not parse that many levels written out.
TEST(NestedValue, FiveHundredLevelsAreTheMost) {
  std::string text = "- &x1 3\n";
  for (int i = 2; i <= 501; ++i) {
    text += "- &x" + std::to_string(i) + " !calc {v: *x" + std::to_string(i - 1) + ", =: v}\n";
  }
  const YAML::Node levels = yaml(text);
  EXPECT_EQ(3.0f, NodeToFloat(levels[499], {}));
  expectErrorAtSomePlace([&] { NodeToFloat(levels[500], {}); }, kTooDeep);
}

TEST(NestedValue, OneHundredThousandValuesAreTheMost) {
  EXPECT_EQ(3.0f, NodeToFloat(yaml(flatMapping(99999)), {}));
  const YAML::Node tooMany = yaml("\n" + flatMapping(100000));
  expectError<Loader::Exception>([&] { NodeToFloat(tooMany, {}); }, {100002, 4}, kTooMany);
}

TEST(NestedValue, DozensOfDefaultsAreFine) {
  FakeStore::instance().reset();
  std::string text = "3";
  for (int i = 0; i < 40; ++i) text = "!config {object: [a, b, c], key: k, default: " + text + "}";
  EXPECT_EQ(3.0f, NodeToFloat(yaml(text), {}));
  EXPECT_EQ(80u, FakeStore::instance().calls.size());
}

TEST(NestedValue, OneAliasUsedAThousandTimesIsFine) {
  std::string text = "!calc\na: &a !calc {x: 2, =: x}\n";
  for (int i = 0; i < 1000; ++i) text += "b" + std::to_string(i) + ": *a\n";
  EXPECT_EQ(2.0f, NodeToFloat(yaml(text + "=: b999\n"), {}));
}

TEST(NestedValue, RefusalLeavesNothingBehind) {
  for (int i = 0; i < 3; ++i) expectRefused("&a !calc {x: *a, =: 1}");
  EXPECT_EQ(5.0f, NodeToFloat(yaml("!calc {x: !calc {y: 5, =: y}, =: x}"), {}));
}

}  // namespace
