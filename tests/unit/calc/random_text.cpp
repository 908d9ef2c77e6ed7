// SPDX-License-Identifier: Apache-2.0
// Texts stay short: a fault in a short text is found as well and read more easily.
#include "random_text.h"

#include <iterator>

namespace {

const char *const kTokens[] = {
    "0",    "1",    "2",   "-1", "0.5", "1e3",  "1e39",  "0x1F", "-0",   "+nan",  "-inf",
    ".",    "x",    "y",   "n",  "z",   "a.b",  "foo",   "_",    "min",  "max",   "ceil",
    "not ", "True", "and", "or", "if",  "else", "False", "(",    ")",    ",",     "+",
    "-",    "*",    "/",   " ",  "\t",  "\n",   "e",     "3",    "min(", "ceil(", "not"};
const char *const kNumbers[] = {"0",    "1",    "2",    "3",    "7",        "-1",    "0.5",  "2.25",
                                "1e3",  "-0",   "+4",   "0x10", "16777217", "1e-45", "1e38", "1e39",
                                "-inf", "-1.5", "+nan", "0.1",  "1e",       ".5"};
const char *const kNames[] = {"x", "y", "n", "z", "a.b", "foo", "True", "False"};
const char *const kInfix[] = {"+", "-", "*", "/", "+", "-", "*", "/", "and", "or", "if"};
const char kLetters[] = " 01.,()+-*/xeandorifltTFms_\t\xc3";

}  // namespace

int RandomText::below(int limit) {
  return static_cast<int>(engine_() % static_cast<unsigned>(limit));
}

std::string RandomText::next() {
  switch (below(6)) {
    case 0:
    case 1:
      return expression(1 + below(4));
    case 2:
    case 3:
      return mutated(expression(1 + below(4)));
    case 4:
      return anyTokens();
    default: {
      std::string text;
      for (int i = below(16); i > 0; --i) text += kLetters[below(sizeof kLetters - 1)];
      return text;
    }
  }
}

std::string RandomText::expression(int depth) {
  std::string text = operand(depth);
  for (int more = below(4); more > 1; --more) {
    text += blanks() + kInfix[below(static_cast<int>(std::size(kInfix)))] + blanks();
    text += operand(depth);
    if (below(6) == 0) text += " else " + operand(depth);
  }
  return text;
}

std::string RandomText::operand(int depth) {
  const int kind = depth > 0 ? below(12) : below(6);
  if (kind < 4) return kNumbers[below(static_cast<int>(std::size(kNumbers)))];
  if (kind < 6) return kNames[below(static_cast<int>(std::size(kNames)))];
  const std::string inner = expression(depth - 1);
  switch (kind) {
    case 6:
    case 7:
      return "(" + blanks() + inner + blanks() + ")";
    case 8:
      return (below(2) ? "min(" : "max(") + inner + "," + blanks() + expression(depth - 1) + ")";
    case 9:
      return "ceil" + blanks() + "(" + inner + ")";
    case 10:
      return "not " + inner;
    default:
      return operand(0) + " if " + operand(depth - 1) + " else " + operand(depth - 1);
  }
}

std::string RandomText::mutated(std::string text) {
  for (int changes = 1 + below(3); changes > 0; --changes) {
    const std::size_t place = static_cast<std::size_t>(below(static_cast<int>(text.size()) + 1));
    switch (below(4)) {
      case 0:
        text.erase(place, 1);
        break;
      case 1:
        text.insert(place, token());
        break;
      case 2:
        text.erase(place, static_cast<std::size_t>(below(4)));
        text.insert(place, token());
        break;
      default:
        text.resize(place);
        text += token();
    }
  }
  return text;
}

std::string RandomText::anyTokens() {
  std::string text;
  for (int i = below(10); i > 0; --i) text += token();
  return text;
}

std::string RandomText::blanks() {
  static const char *const kBlanks[] = {"", "", " ", " ", " ", "\t", "  ", "\n"};
  return kBlanks[below(static_cast<int>(std::size(kBlanks)))];
}

const char *RandomText::token() {
  return kTokens[below(static_cast<int>(std::size(kTokens)))];
}
