// SPDX-License-Identifier: Apache-2.0
// Mirrors the grammar of the evaluator:
//
//   expression := operand tail
//   tail       := ( "*" operand | "/" operand )* [ "+" expression | "-" operand tail ]
//   operand    := ( "(" expression ")" | number | name | function ) chain
//   chain      := [ "and" operand tail | "or" operand tail | "if" operand [ "else" operand ] tail ]
#include "plan_check/expression.h"

#include <array>
#include <cctype>
#include <charconv>
#include <cmath>
#include <cstdlib>
#include <utility>

namespace Plan {
namespace {

using Kind = Expression::Kind;

// Ends the reading of a text that is not an expression.
struct NotAnExpression {};

bool isSpace(char c) {
  return std::isspace(static_cast<unsigned char>(c)) != 0;
}

bool isNamePart(char c) {
  return std::isalnum(static_cast<unsigned char>(c)) != 0 || c == '_' || c == '.';
}

Expression leaf(Kind kind, std::string text, float value) {
  Expression expression;
  expression.kind = kind;
  expression.text = std::move(text);
  expression.value = value;
  return expression;
}

float valueOf(Kind kind, const std::vector<Expression> &parts) {
  const float first = parts[0].value;
  const float second = parts.size() > 1 ? parts[1].value : 0.0F;
  switch (kind) {
    case Kind::kMin:
      return second < first ? second : first;
    case Kind::kMax:
      return second > first ? second : first;
    case Kind::kCeil:
      return std::ceil(first);
    case Kind::kNot:
      return first == 0.0F ? 1.0F : 0.0F;
    case Kind::kAdd:
      return first + second;
    case Kind::kSubtract:
      return first - second;
    case Kind::kMultiply:
      return first * second;
    case Kind::kDivide:
      return first / second;
    case Kind::kAnd:
      return first != 0.0F && second != 0.0F ? 1.0F : 0.0F;
    case Kind::kOr:
      return first != 0.0F || second != 0.0F ? 1.0F : 0.0F;
    case Kind::kIf:
      if (second != 0.0F) return first;
      return parts.size() > 2 ? parts[2].value : 0.0F;
    default:
      return 0.0F;
  }
}

template <typename... Parts>
Expression made(Kind kind, Parts... parts) {
  Expression expression;
  expression.kind = kind;
  expression.parts.reserve(sizeof...(parts));
  (expression.parts.push_back(std::move(parts)), ...);
  expression.value = valueOf(kind, expression.parts);
  return expression;
}

class Reader {
 public:
  Reader(const std::string &text, const Calc::VariableTable &variables)
      : text_(text), variables_(variables) {}

  Expression whole() {
    Expression all = expression(0);
    if (at(cursor_) != '\0') throw NotAnExpression();
    return all;
  }

 private:
  Expression expression(size_t start) { return tail(operand(start)); }

  Expression tail(Expression left) {
    for (;;) {
      const size_t sign = skipSpace(cursor_);
      const size_t after = skipSpace(sign + 1);
      switch (at(sign)) {
        case '+':
          return made(Kind::kAdd, std::move(left), expression(after));
        case '-':
          return made(Kind::kSubtract, std::move(left), tail(operand(after)));
        case '*':
          left = made(Kind::kMultiply, std::move(left), operand(after));
          break;
        case '/':
          left = made(Kind::kDivide, std::move(left), operand(after));
          break;
        default:
          cursor_ = sign;
          return left;
      }
    }
  }

  Expression operand(size_t start) {
    const char first = at(start);
    if (first == '(') return chain(inParentheses(start));
    if (std::isalpha(static_cast<unsigned char>(first)) != 0 || first == '_') {
      return chain(named(start));
    }
    return chain(number(start));
  }

  Expression inParentheses(size_t open) {
    Expression inner = expression(skipSpace(open + 1));
    expect(')');
    return inner;
  }

  Expression number(size_t start) {
    const char *const begin = text_.c_str() + start;
    char *end = nullptr;
    const double value = std::strtod(begin, &end);
    if (end == begin) throw NotAnExpression();
    cursor_ = start + static_cast<size_t>(end - begin);
    const size_t first = skipSpace(start);
    return leaf(Kind::kNumber, text_.substr(first, cursor_ - first), static_cast<float>(value));
  }

  // "True" and "False" are refused here at once: the evaluator does not move its cursor behind
  // them, so that every text with them fails.
  Expression named(size_t start) {
    size_t end = start;
    while (isNamePart(at(end))) ++end;
    const std::string name = text_.substr(start, end - start);
    cursor_ = end;
    const auto variable = variables_.find(name);
    if (variable != variables_.end()) return leaf(Kind::kVariable, name, variable->second);
    if (name == "min") return ofTwo(Kind::kMin);
    if (name == "max") return ofTwo(Kind::kMax);
    if (name == "ceil") return made(Kind::kCeil, inParentheses(openingBracket()));
    if (name == "not") return made(Kind::kNot, expression(skipSpace(cursor_)));
    throw NotAnExpression();
  }

  Expression ofTwo(Kind kind) {
    Expression first = expression(skipSpace(openingBracket() + 1));
    expect(',');
    Expression second = expression(skipSpace(cursor_));
    expect(')');
    return made(kind, std::move(first), std::move(second));
  }

  Expression chain(Expression value) {
    const size_t word = skipSpace(cursor_);
    if (starts(word, "and")) return joined(Kind::kAnd, std::move(value), word + 3);
    if (starts(word, "or")) return joined(Kind::kOr, std::move(value), word + 2);
    if (starts(word, "if")) return conditional(std::move(value), word + 2);
    cursor_ = word;
    return value;
  }

  Expression joined(Kind kind, Expression left, size_t afterWord) {
    return tail(made(kind, std::move(left), operand(skipSpace(afterWord))));
  }

  Expression conditional(Expression value, size_t afterWord) {
    Expression condition = operand(skipSpace(afterWord));
    const size_t next = skipSpace(cursor_);
    if (!starts(next, "else")) {
      return tail(made(Kind::kIf, std::move(value), std::move(condition)));
    }
    Expression alternative = operand(skipSpace(next + 4));
    return tail(made(Kind::kIf, std::move(value), std::move(condition), std::move(alternative)));
  }

  size_t openingBracket() const {
    const size_t open = skipSpace(cursor_);
    if (at(open) != '(') throw NotAnExpression();
    return open;
  }

  // The cursor is at the first character that is not blank; it moves behind that one.
  void expect(char wanted) {
    if (at(cursor_) != wanted) throw NotAnExpression();
    ++cursor_;
  }

  char at(size_t place) const { return place < text_.size() ? text_[place] : '\0'; }

  size_t skipSpace(size_t place) const {
    while (isSpace(at(place))) ++place;
    return place;
  }

  bool starts(size_t place, const char *word) const {
    return place <= text_.size() &&
           text_.compare(place, std::char_traits<char>::length(word), word) == 0;
  }

  const std::string &text_;
  const Calc::VariableTable &variables_;
  size_t cursor_ = 0;
};

const char *signOf(Kind kind) {
  switch (kind) {
    case Kind::kAdd:
      return " + ";
    case Kind::kSubtract:
      return " - ";
    case Kind::kMultiply:
      return " * ";
    case Kind::kDivide:
      return " / ";
    case Kind::kAnd:
      return " and ";
    default:
      return " or ";
  }
}

bool standsAlone(const Expression &part) {
  switch (part.kind) {
    case Kind::kNumber:
    case Kind::kVariable:
    case Kind::kMin:
    case Kind::kMax:
    case Kind::kCeil:
      return true;
    default:
      return false;
  }
}

std::string inBrackets(const Expression &part) {
  return standsAlone(part) ? bracketed(part) : "(" + bracketed(part) + ")";
}

}  // namespace

std::optional<Expression> readExpression(const std::string &text,
                                         const Calc::VariableTable &variables) {
  const std::string untilNul = text.c_str();
  try {
    return Reader(untilNul, variables).whole();
  } catch (const NotAnExpression &) {
    return std::nullopt;
  }
}

std::string bracketed(const Expression &expression) {
  const std::vector<Expression> &parts = expression.parts;
  switch (expression.kind) {
    case Kind::kNumber:
    case Kind::kVariable:
      return expression.text;
    case Kind::kMin:
      return "min(" + bracketed(parts[0]) + ", " + bracketed(parts[1]) + ")";
    case Kind::kMax:
      return "max(" + bracketed(parts[0]) + ", " + bracketed(parts[1]) + ")";
    case Kind::kCeil:
      return "ceil(" + bracketed(parts[0]) + ")";
    case Kind::kNot:
      return "not " + inBrackets(parts[0]);
    case Kind::kIf: {
      const std::string text = inBrackets(parts[0]) + " if " + inBrackets(parts[1]);
      return parts.size() > 2 ? text + " else " + inBrackets(parts[2]) : text;
    }
    default:
      return inBrackets(parts[0]) + signOf(expression.kind) + inBrackets(parts[1]);
  }
}

std::string numberText(float value) {
  constexpr float kExactIntegers = 1e15F;
  if (std::trunc(value) == value && std::fabs(value) < kExactIntegers) {
    return std::to_string(static_cast<long long>(value));
  }
  std::array<char, 64> text;
  const auto end = std::to_chars(text.data(), text.data() + text.size(), value).ptr;
  return std::string(text.data(), end);
}

}  // namespace Plan
