// SPDX-License-Identifier: Apache-2.0
// Each function below is one sentence group of the language's rules: it is given where to start and
// the cursor so far, and gives back a value and the cursor after it. Nothing is changed in place.
#include "naive_evaluator.h"

#include <cctype>
#include <cmath>
#include <cstdlib>

namespace Naive {
namespace {

// Added on top where there is nothing to add. A positive zero would lose the sign of -0.
constexpr float kNothing = -0.0f;

struct Fault {
  std::string message;
  std::size_t position;
};

// Where reading has come to. "True" and "False" leave it where it was, so an operator before them
// comes up again; everything before `taken` has been taken once and would be taken for ever.
struct Cursor {
  std::size_t at;
  std::size_t taken;
};

struct Reading {
  float value;
  Cursor cursor;
};

class Rules {
 public:
  Rules(const std::string &text, const Variables &variables) : text_(text), variables_(variables) {}

  // The whole text is one expression, and nothing is left after it.
  float whole() const {
    const Reading all = expression(0, Cursor{0, 0}, kNothing);
    if (at(all.cursor.at) != '\0') throw Fault{"unexpected char", all.cursor.at};
    return all.value;
  }

 private:
  // expression: an operand, then its tail, then the addend on top.
  Reading expression(std::size_t start, Cursor cursor, float addend) const {
    const Reading first = operand(start, cursor);
    const Reading rest = tail(first.value, first.cursor);
    return {rest.value + addend, rest.cursor};
  }

  // operand: "(" expression ")", a number, or something that begins with a name; then its chain.
  Reading operand(std::size_t start, Cursor cursor) const {
    if (at(start) == '(') return chain(parenthesis(start, cursor));
    if (!isLetter(at(start)) && at(start) != '_') return chain(number(start, cursor));
    return chain(named(start, cursor));
  }

  // A pair of parentheses has a cursor of its own, which begins at the "(".
  Reading parenthesis(std::size_t start, Cursor cursor) const {
    const Reading inner = expression(blanksAfter(start + 1), Cursor{start, 0}, kNothing);
    if (at(inner.cursor.at) != ')') throw Fault{"expected )", inner.cursor.at};
    return {inner.value, Cursor{inner.cursor.at + 1, cursor.taken}};
  }

  Reading number(std::size_t start, Cursor cursor) const {
    const char *begin = text_.c_str() + start;
    char *end = nullptr;
    const double read = std::strtod(begin, &end);
    if (end == begin) throw Fault{"Missing numeric value.", start};
    const std::size_t length = static_cast<std::size_t>(end - begin);
    return {static_cast<float>(read), Cursor{start + length, cursor.taken}};
  }

  // A variable comes before every word of the language.
  Reading named(std::size_t start, Cursor cursor) const {
    const std::string name = nameAt(start);
    const std::size_t end = start + name.size();
    const auto variable = variables_.find(name);
    if (variable != variables_.end()) return {variable->second, Cursor{end, cursor.taken}};
    if (name == "min" || name == "max") return smallerOrLarger(name, end, cursor);
    if (name == "ceil") return ceiling(end, cursor);
    if (name == "not") {
      const Reading all = expression(blanksAfter(end), cursor, kNothing);
      return {all.value == 0 ? 1.0f : 0.0f, all.cursor};
    }
    if (name == "True") return {1, cursor};
    if (name == "False") return {0, cursor};
    throw Fault{"unexpected symbol: " + name, start};
  }

  // min and max: "(" expression "," expression ")", both arguments with one cursor.
  Reading smallerOrLarger(const std::string &name, std::size_t end, Cursor cursor) const {
    const std::size_t open = blanksAfter(end);
    if (at(open) != '(') throw Fault{name + " expected (", open};
    const Reading first = expression(blanksAfter(open + 1), Cursor{open, 0}, kNothing);
    const std::size_t comma = first.cursor.at;
    if (at(comma) != ',') throw Fault{name + " expected ,", comma};
    const Reading second = expression(blanksAfter(comma + 1), first.cursor, kNothing);
    const std::size_t close = second.cursor.at;
    if (at(close) != ')') throw Fault{name + " expected )", close};
    const bool secondWins = name == "min" ? second.value < first.value : second.value > first.value;
    return {secondWins ? second.value : first.value, Cursor{close + 1, cursor.taken}};
  }

  Reading ceiling(std::size_t end, Cursor cursor) const {
    const std::size_t open = blanksAfter(end);
    if (at(open) != '(') throw Fault{"ceil expected (", open};
    const Reading inner = expression(blanksAfter(open + 1), Cursor{open, 0}, kNothing);
    if (at(inner.cursor.at) != ')') throw Fault{"ceil expected )", inner.cursor.at};
    return {std::ceil(inner.value), Cursor{inner.cursor.at + 1, cursor.taken}};
  }

  // chain: at most one logical word, which need not end as a word.
  Reading chain(Reading left) const {
    const std::size_t word = blanksAfter(left.cursor.at);
    if (starts(word, "and")) {
      const Reading right = operand(blanksAfter(word + 3), take(left.cursor, word));
      return tail(left.value != 0 && right.value != 0 ? 1.0f : 0.0f, right.cursor);
    }
    if (starts(word, "or")) {
      const Reading right = operand(blanksAfter(word + 2), take(left.cursor, word));
      return tail(left.value != 0 || right.value != 0 ? 1.0f : 0.0f, right.cursor);
    }
    if (starts(word, "if")) return condition(left.value, word, left.cursor);
    return {left.value, Cursor{word, left.cursor.taken}};
  }

  // An "else" that comes up a second time is not taken for ever, so it is not counted.
  Reading condition(float value, std::size_t word, Cursor cursor) const {
    const Reading asked = operand(blanksAfter(word + 2), take(cursor, word));
    const std::size_t next = blanksAfter(asked.cursor.at);
    if (!starts(next, "else")) return tail(asked.value != 0 ? value : 0.0f, asked.cursor);
    const Reading other = operand(blanksAfter(next + 4), asked.cursor);
    return tail(asked.value != 0 ? value : other.value, other.cursor);
  }

  // tail: "+" and "-" take everything that follows, "*" and "/" the next operand.
  Reading tail(float left, Cursor cursor) const {
    const std::size_t place = blanksAfter(cursor.at);
    const std::size_t next = blanksAfter(place + 1);
    switch (at(place)) {
      case '+':
        return expression(next, take(cursor, place), left);
      case '-': {
        const Reading first = operand(next, take(cursor, place));
        const Reading all = tail(first.value, first.cursor);
        return {left - all.value, all.cursor};
      }
      case '*': {
        const Reading right = operand(next, take(cursor, place));
        return tail(left * right.value, right.cursor);
      }
      case '/': {
        const Reading right = operand(next, take(cursor, place));
        return tail(left / right.value, right.cursor);
      }
      default:
        return {left, Cursor{place, cursor.taken}};
    }
  }

  static Cursor take(Cursor cursor, std::size_t place) {
    if (place < cursor.taken) {
      throw Fault{"expression never ends: True or False after an operator", place};
    }
    return {cursor.at, place + 1};
  }

  char at(std::size_t place) const { return place < text_.size() ? text_[place] : '\0'; }

  bool starts(std::size_t place, const std::string &word) const {
    return place <= text_.size() && text_.compare(place, word.size(), word) == 0;
  }

  std::size_t blanksAfter(std::size_t place) const {
    while (std::isspace(static_cast<unsigned char>(at(place)))) ++place;
    return place;
  }

  static bool isLetter(char c) { return std::isalpha(static_cast<unsigned char>(c)) != 0; }

  std::string nameAt(std::size_t start) const {
    std::size_t end = start;
    while (std::isalnum(static_cast<unsigned char>(at(end))) || at(end) == '_' || at(end) == '.') {
      ++end;
    }
    return text_.substr(start, end - start);
  }

  const std::string &text_;
  const Variables &variables_;
};

}  // namespace

Outcome evaluate(const std::string &text, const Variables &variables) {
  const std::string untilNul = text.c_str();
  Outcome outcome;
  try {
    outcome.value = Rules(untilNul, variables).whole();
  } catch (const Fault &fault) {
    outcome.failed = true;
    outcome.message = fault.message;
    outcome.position = fault.position;
  }
  return outcome;
}

}  // namespace Naive
