// SPDX-License-Identifier: Apache-2.0
// What the loader refuses is an error of the check, and what it accepts is not: on every definition
// of the tree, and on texts that are these with some bytes changed.
#include <gtest/gtest.h>
#include <yaml-cpp/yaml.h>

#include <algorithm>
#include <exception>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <random>
#include <string>
#include <vector>

#include "loader/resource_pool.h"
#include "plan_check/definition_check.h"
#include "plan_check/machine.h"

namespace {

namespace fs = std::filesystem;

const Calc::VariableTable &facts() {
  static const Calc::VariableTable kFacts = Plan::unknownMachine().facts;
  return kFacts;
}

std::vector<std::string> definitions() {
  std::vector<std::string> texts;
  for (const std::string folder :
       {PLAN_CASES "/mistakes", PLAN_CASES "/correct", EXAMPLES, SEEDS}) {
    for (const auto &entry : fs::directory_iterator(folder)) {
      std::ifstream stream(entry.path(), std::ios::binary);
      texts.emplace_back(std::istreambuf_iterator<char>(stream), std::istreambuf_iterator<char>());
    }
  }
  std::sort(texts.begin(), texts.end());  // the folders' own order would change from run to run
  return texts;
}

// Empty: the loader accepts the text.
std::string refusal(const std::string &text) {
  try {
    const YAML::Node document = YAML::Load(text);
    for (const auto &item : document) Loader::ResourcePoolImpl(item, facts());
  } catch (const std::exception &error) {
    return error.what();
  }
  return {};
}

bool isUnreadable(const std::string &text) {
  const Plan::CheckedFile checked = Plan::checkText("file", text, facts());
  return std::any_of(checked.findings.begin(), checked.findings.end(),
                     [](const Plan::Finding &finding) {
                       return finding.severity == Plan::Severity::kError && !finding.isAtLoad;
                     });
}

std::string changed(std::string text, std::mt19937 *random) {
  static const std::vector<std::string> kPieces = {
      "-",      " ",  ":",   "\n",    "\t",     "\"",        "'",        "!calc ", "!config ",
      "{",      "}",  "[",   "]",     ",",      "1",         "~",        "=:",     "#",
      "- name", "*x", "&x ", "mem: ", "True",   "a - b",     "\r",       "\0",     "(",
      ")",      "|",  ">",   "---\n", "object", "default: ", "\xc3\xa9", "<<: *x", "?"};
  const auto below = [random](size_t limit) { return (*random)() % std::max<size_t>(limit, 1); };
  for (size_t changes = 1 + below(3); changes > 0; --changes) {
    const size_t at = below(text.size() + 1);
    if (below(2) == 0) text.erase(at, below(4));
    if (below(3) > 0) text.insert(std::min(at, text.size()), kPieces[below(kPieces.size())]);
  }
  return text;
}

TEST(Agreement, HoldsForEveryDefinitionOfTheTree) {
  const std::vector<std::string> texts = definitions();
  ASSERT_GT(texts.size(), 140U);
  for (const std::string &text : texts) {
    EXPECT_EQ(isUnreadable(text), !refusal(text).empty()) << text << "\n" << refusal(text);
  }
}

TEST(Agreement, HoldsForChangedDefinitions) {
  // That release alone makes a null under a tag something else than a scalar.
  if (!YAML::Load("!tag ~").IsScalar()) {
    GTEST_SKIP() << "yaml-cpp 0.6.3 never ends on some texts with unbalanced brackets";
  }
  const std::vector<std::string> texts = definitions();
  std::mt19937 random(20261121);
  size_t refused = 0;
  constexpr size_t kTexts = 10000;
  for (size_t i = 0; i < kTexts; ++i) {
    const std::string text = changed(texts[i % texts.size()], &random);
    const std::string reason = refusal(text);
    ASSERT_EQ(isUnreadable(text), !reason.empty()) << text << "\n" << reason;
    refused += reason.empty() ? 0 : 1;
  }
  EXPECT_GT(refused, kTexts / 10);
  EXPECT_LT(refused, kTexts - kTexts / 10);
}

// A value that holds itself, and one that holds many more, end in bounded time.
TEST(Agreement, HoldsForAliasesWithoutEnd) {
  std::string text = "- name: a\n  memMax: &a !calc {b: *a, =: b}\n";
  EXPECT_EQ(isUnreadable(text), !refusal(text).empty());
  text = "- name: a\n  memMax: !calc\n    x0: &x0 !calc {y: 1, =: unknown}\n";
  for (int i = 1; i < 20; ++i) {
    const std::string before = "*x" + std::to_string(i - 1);
    text += "    x" + std::to_string(i) + ": &x" + std::to_string(i) + " !calc {p: " + before +
            " , q: " + before + " , =: p}\n";
  }
  EXPECT_TRUE(isUnreadable(text + "    =: x19\n"));
}

}  // namespace
