// SPDX-License-Identifier: Apache-2.0
// Reads and computes an expression in one pass, with one function for each rule of the grammar:
//
//   expression := operand tail
//   tail       := ( "*" operand | "/" operand )* [ "+" expression | "-" operand tail ]
//   operand    := ( "(" expression ")" | number | name | function ) chain
//   chain      := [ "and" operand tail | "or" operand tail | "if" operand [ "else" operand ] tail ]
//
// So logical words bind tighter than arithmetic, and all operators except "*" and "/" group to the
// right: `10 - 2 - 3` is 11. Definitions rely on it.
#include "calc/evaluator.h"

#include <cctype>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <string_view>

namespace Calc {
namespace {

// Far deeper than people write, and within a stack of 8 MiB. The outermost expression is a level.
constexpr int kMaxLevels = 5000;

// -0.0f, the additive identity: adding +0 would turn -0 into +0.
constexpr float kNoAddend = -0.0F;

constexpr const char *kTooDeep = "expression nested too deeply";
constexpr const char *kNoEnd = "expression never ends: True or False after an operator";

bool isSpace(char c) {
  return std::isspace(static_cast<unsigned char>(c)) != 0;
}

bool isNameStart(char c) {
  return std::isalpha(static_cast<unsigned char>(c)) != 0 || c == '_';
}

bool isNamePart(char c) {
  return std::isalnum(static_cast<unsigned char>(c)) != 0 || c == '_' || c == '.';
}

bool startsWith(const char *text, const char *word) {
  return std::strncmp(text, word, std::strlen(word)) == 0;
}

bool isTrue(float value) {
  return value != 0.0F;
}

float truth(bool value) {
  return value ? 1.0F : 0.0F;
}

const char *skipSpace(const char *at) {
  while (isSpace(*at)) ++at;
  return at;
}

// These functions build strings and are never inlined: their locals would enlarge every stack frame
// of the recursion, most of all with a sanitizer's red zones around them.
[[noreturn, gnu::noinline]] void fail(const char *message, const char *position) {
  throw Exception(message, position);
}

[[noreturn, gnu::noinline]] void failExpected(const char *name, const char *what,
                                              const char *position) {
  throw Exception(std::string(name) + " expected " + what, position);
}

[[noreturn, gnu::noinline]] void failUnknown(const char *name, const char *after) {
  throw Exception("unexpected symbol: " + std::string(name, after), name);
}

enum class Word { kNone, kMin, kMax, kCeil, kNot, kTrue, kFalse };

[[gnu::noinline]] Word wordOf(const char *name, const char *after) {
  const std::string_view text(name, static_cast<size_t>(after - name));
  if (text == "min") return Word::kMin;
  if (text == "max") return Word::kMax;
  if (text == "ceil") return Word::kCeil;
  if (text == "not") return Word::kNot;
  if (text == "True") return Word::kTrue;
  if (text == "False") return Word::kFalse;
  return Word::kNone;
}

// The cursor is where reading stopped. It is a member and not a local of every level to keep the
// stack frames of the recursion small. A function that reads inside parentheses first sets it to
// the opening one, because "True" and "False" do not move it.
class Reader {
 public:
  Reader(const char *text, const VariableTable &variables)
      : variables_(variables), cursor_(text), nextOperator_(text) {}

  float evaluate();

 private:
  float ParseExpression(const char *start, float addend);
  float ParseTail(float left);
  float ParseOperand(const char *start);

  float readParenthesis(const char *open);
  float readNumber(const char *start);
  float readNamed(const char *start);
  float readMinMax(Word word, const char *after);
  float readCeil(const char *after);
  float readNot(const char *after);
  float readChain(float value);
  float readAnd(const char *word, float value);
  float readOr(const char *word, float value);
  float readIf(const char *word, float value);

  const float *findVariable(const char *name, const char *after) const;
  void enterLevel(const char *place);
  void takeOperator(const char *place);

  const VariableTable &variables_;
  const char *cursor_;
  const char *nextOperator_;  // the next operator is here or later
  int level_ = 0;             // not restored by an exception: a Reader evaluates one text, once
};

float Reader::evaluate() {
  const float value = ParseExpression(cursor_, kNoAddend);
  if (*cursor_ != '\0') fail("unexpected char", cursor_);
  return value;
}

void Reader::enterLevel(const char *place) {
  if (++level_ > kMaxLevels) fail(kTooDeep, place);
}

// After an operator, "True" and "False" leave the cursor at that operator, which would be read
// again without end.
void Reader::takeOperator(const char *place) {
  if (place < nextOperator_) fail(kNoEnd, place);
  nextOperator_ = place + 1;
}

// expression := operand tail
float Reader::ParseExpression(const char *start, float addend) {
  enterLevel(start);
  const float value = ParseTail(ParseOperand(start)) + addend;
  --level_;
  return value;
}

// tail := ( "*" operand | "/" operand )* [ "+" expression | "-" operand tail ]
float Reader::ParseTail(float left) {
  for (;;) {
    const char *const sign = skipSpace(cursor_);
    const char *const after = *sign == '\0' ? sign : skipSpace(sign + 1);
    switch (*sign) {
      case '+':
        takeOperator(sign);
        return ParseExpression(after, left);
      case '-': {
        takeOperator(sign);
        enterLevel(after);
        const float right = ParseTail(ParseOperand(after));
        --level_;
        return left - right;
      }
      case '*':
        takeOperator(sign);
        left *= ParseOperand(after);
        break;
      case '/':
        takeOperator(sign);
        left /= ParseOperand(after);
        break;
      default:
        cursor_ = sign;
        return left;
    }
  }
}

// operand := ( "(" expression ")" | number | name | function ) chain
float Reader::ParseOperand(const char *start) {
  if (*start == '(') return readChain(readParenthesis(start));
  if (isNameStart(*start)) return readChain(readNamed(start));
  return readChain(readNumber(start));
}

float Reader::readParenthesis(const char *open) {
  cursor_ = open;
  const float value = ParseExpression(skipSpace(open + 1), kNoAddend);
  if (*cursor_ != ')') fail("expected )", cursor_);
  ++cursor_;
  return value;
}

// The sign belongs to the literal: there is no unary minus.
float Reader::readNumber(const char *start) {
  char *end = nullptr;
  const double value = std::strtod(start, &end);
  if (end == start) fail("Missing numeric value.", start);
  cursor_ = end;
  return static_cast<float>(value);
}

// A variable hides the word of the language that has the same name.
float Reader::readNamed(const char *start) {
  const char *after = start;
  while (isNamePart(*after)) ++after;
  if (const float *variable = findVariable(start, after)) {
    cursor_ = after;
    return *variable;
  }
  const Word word = wordOf(start, after);
  switch (word) {
    case Word::kMin:
    case Word::kMax:
      return readMinMax(word, after);
    case Word::kCeil:
      return readCeil(after);
    case Word::kNot:
      return readNot(after);
    // Neither word moves the cursor, so every text with one fails. Part of the language.
    case Word::kTrue:
      return 1.0F;
    case Word::kFalse:
      return 0.0F;
    case Word::kNone:
      break;
  }
  failUnknown(start, after);
}

[[gnu::noinline]] const float *Reader::findVariable(const char *name, const char *after) const {
  const auto found = variables_.find(std::string(name, after));
  return found == variables_.end() ? nullptr : &found->second;
}

// On a tie, or if either argument is NaN, the result is the first argument.
float Reader::readMinMax(Word word, const char *after) {
  const char *const name = word == Word::kMin ? "min" : "max";
  const char *const open = skipSpace(after);
  if (*open != '(') failExpected(name, "(", open);
  cursor_ = open;
  const float a = ParseExpression(skipSpace(open + 1), kNoAddend);
  if (*cursor_ != ',') failExpected(name, ",", cursor_);
  const float b = ParseExpression(skipSpace(cursor_ + 1), kNoAddend);
  if (*cursor_ != ')') failExpected(name, ")", cursor_);
  ++cursor_;
  const bool second = word == Word::kMin ? b < a : b > a;
  return second ? b : a;
}

float Reader::readCeil(const char *after) {
  const char *const open = skipSpace(after);
  if (*open != '(') failExpected("ceil", "(", open);
  cursor_ = open;
  const float value = std::ceil(ParseExpression(skipSpace(open + 1), kNoAddend));
  if (*cursor_ != ')') failExpected("ceil", ")", cursor_);
  ++cursor_;
  return value;
}

// "not" negates the whole expression that follows: `not x + 1` is not (x + 1).
float Reader::readNot(const char *after) {
  return truth(!isTrue(ParseExpression(skipSpace(after), kNoAddend)));
}

// chain := [ "and" operand tail | "or" operand tail | "if" operand [ "else" operand ] tail ]
// A word need not end there: `3order` reads as 3 or der. The tail counts as part of the word's
// level, because in `1 and 1 * 1 and 1 * ...` each word is inside the tail of the one before.
float Reader::readChain(float value) {
  const char *const word = skipSpace(cursor_);
  if (startsWith(word, "and")) return readAnd(word, value);
  if (startsWith(word, "or")) return readOr(word, value);
  if (startsWith(word, "if")) return readIf(word, value);
  cursor_ = word;
  return value;
}

float Reader::readAnd(const char *word, float value) {
  takeOperator(word);
  enterLevel(word);
  const float right = ParseOperand(skipSpace(word + 3));
  const float all = ParseTail(truth(isTrue(value) && isTrue(right)));
  --level_;
  return all;
}

float Reader::readOr(const char *word, float value) {
  takeOperator(word);
  enterLevel(word);
  const float right = ParseOperand(skipSpace(word + 2));
  const float all = ParseTail(truth(isTrue(value) || isTrue(right)));
  --level_;
  return all;
}

float Reader::readIf(const char *word, float value) {
  takeOperator(word);
  enterLevel(word);
  const float condition = ParseOperand(skipSpace(word + 2));
  const char *const next = skipSpace(cursor_);
  const float alternative = startsWith(next, "else") ? ParseOperand(skipSpace(next + 4)) : 0.0F;
  const float all = ParseTail(isTrue(condition) ? value : alternative);
  --level_;
  return all;
}

}  // namespace

float Evaluate(const char *text, const VariableTable &variables) {
  return Reader(text, variables).evaluate();
}

float Evaluate(const std::string &text, const VariableTable &variables) {
  return Evaluate(text.c_str(), variables);
}

}  // namespace Calc
