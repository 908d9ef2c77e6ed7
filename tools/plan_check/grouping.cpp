// SPDX-License-Identifier: Apache-2.0
// Reads the text with the usual precedence, and compares both readings as flat lists of terms and
// factors, so that "a + b + c" is the same either way.
#include "plan_check/grouping.h"

#include <cctype>
#include <cstdlib>
#include <utility>
#include <vector>

namespace Plan {
namespace {

using Kind = Expression::Kind;

struct NotReadable {};

// expression := disjunction [ "if" disjunction [ "else" expression ] ], and so on downwards.
class UsualReader {
 public:
  UsualReader(const std::string &text, const Calc::VariableTable &variables)
      : text_(text), variables_(variables) {}

  Expression whole() {
    Expression all = expression();
    skipSpace();
    if (cursor_ != text_.size()) throw NotReadable();
    return all;
  }

 private:
  Expression expression() {
    Expression value = disjunction();
    if (!takes("if")) return value;
    Expression choice = made(Kind::kIf, std::move(value), disjunction());
    if (takes("else")) choice.parts.push_back(expression());
    return choice;
  }

  Expression disjunction() {
    Expression left = conjunction();
    while (takes("or")) left = made(Kind::kOr, std::move(left), conjunction());
    return left;
  }

  Expression conjunction() {
    Expression left = negation();
    while (takes("and")) left = made(Kind::kAnd, std::move(left), negation());
    return left;
  }

  Expression negation() {
    skipSpace();
    if (variables_.count("not") == 0 && nameHere() == "not") {
      cursor_ += 3;
      return madeOfOne(Kind::kNot, negation());
    }
    return sum();
  }

  Expression sum() {
    Expression left = product();
    for (;;) {
      if (takes("+")) {
        left = made(Kind::kAdd, std::move(left), product());
      } else if (takes("-")) {
        left = made(Kind::kSubtract, std::move(left), product());
      } else {
        return left;
      }
    }
  }

  Expression product() {
    Expression left = operand();
    for (;;) {
      if (takes("*")) {
        left = made(Kind::kMultiply, std::move(left), operand());
      } else if (takes("/")) {
        left = made(Kind::kDivide, std::move(left), operand());
      } else {
        return left;
      }
    }
  }

  Expression operand() {
    skipSpace();
    if (takes("(")) {
      Expression inner = expression();
      require(")");
      return inner;
    }
    const std::string name = nameHere();
    if (name.empty()) return number();
    cursor_ += name.size();
    const auto variable = variables_.find(name);
    if (variable != variables_.end()) return leaf(Kind::kVariable, name);
    if (name == "min") return ofTwo(Kind::kMin);
    if (name == "max") return ofTwo(Kind::kMax);
    if (name != "ceil") throw NotReadable();
    require("(");
    Expression inner = madeOfOne(Kind::kCeil, expression());
    require(")");
    return inner;
  }

  Expression ofTwo(Kind kind) {
    require("(");
    Expression first = expression();
    require(",");
    Expression second = expression();
    require(")");
    return made(kind, std::move(first), std::move(second));
  }

  Expression number() {
    const char *const begin = text_.c_str() + cursor_;
    char *end = nullptr;
    (void)std::strtod(begin, &end);
    if (end == begin) throw NotReadable();
    const std::string written(begin, static_cast<size_t>(end - begin));
    cursor_ += written.size();
    return leaf(Kind::kNumber, written);
  }

  static Expression leaf(Kind kind, const std::string &text) {
    Expression expression;
    expression.kind = kind;
    expression.text = text;
    return expression;
  }

  static Expression madeOfOne(Kind kind, Expression part) {
    Expression expression;
    expression.kind = kind;
    expression.parts.push_back(std::move(part));
    return expression;
  }

  static Expression made(Kind kind, Expression left, Expression right) {
    Expression expression = madeOfOne(kind, std::move(left));
    expression.parts.push_back(std::move(right));
    return expression;
  }

  std::string nameHere() const {
    const auto isStart = [](char c) {
      return std::isalpha(static_cast<unsigned char>(c)) != 0 || c == '_';
    };
    if (cursor_ >= text_.size() || !isStart(text_[cursor_])) return {};
    size_t end = cursor_;
    while (end < text_.size() && (isStart(text_[end]) || text_[end] == '.' ||
                                  std::isdigit(static_cast<unsigned char>(text_[end])) != 0)) {
      ++end;
    }
    return text_.substr(cursor_, end - cursor_);
  }

  bool takes(const std::string &sign) {
    skipSpace();
    if (text_.compare(cursor_, sign.size(), sign) != 0) return false;
    cursor_ += sign.size();
    return true;
  }

  void require(const std::string &sign) {
    if (!takes(sign)) throw NotReadable();
  }

  void skipSpace() {
    while (cursor_ < text_.size() &&
           std::isspace(static_cast<unsigned char>(text_[cursor_])) != 0) {
      ++cursor_;
    }
  }

  const std::string &text_;
  const Calc::VariableTable &variables_;
  size_t cursor_ = 0;
};

std::string flat(const Expression &expression);

// The terms of a sum, or the factors of a product, each behind its sign.
void collect(const Expression &part, Kind plus, Kind minus, bool negative, std::string *list) {
  if (part.kind == plus || part.kind == minus) {
    collect(part.parts[0], plus, minus, negative, list);
    collect(part.parts[1], plus, minus, negative != (part.kind == minus && minus != plus), list);
  } else {
    *list += (negative ? " <" : " >") + flat(part);
  }
}

// A text that is equal for expressions that are the same up to the order of brackets in sums,
// products and chains of one logical word.
std::string flat(const Expression &expression) {
  std::string list;
  switch (expression.kind) {
    case Kind::kNumber:
    case Kind::kVariable:
      return expression.text;
    case Kind::kAdd:
    case Kind::kSubtract:
      collect(expression, Kind::kAdd, Kind::kSubtract, false, &list);
      return "(sum" + list + ")";
    case Kind::kMultiply:
    case Kind::kDivide:
      collect(expression, Kind::kMultiply, Kind::kDivide, false, &list);
      return "(product" + list + ")";
    case Kind::kAnd:
      collect(expression, Kind::kAnd, Kind::kAnd, false, &list);
      return "(and" + list + ")";
    case Kind::kOr:
      collect(expression, Kind::kOr, Kind::kOr, false, &list);
      return "(or" + list + ")";
    default:
      list = std::to_string(static_cast<int>(expression.kind));
      for (const Expression &part : expression.parts) list += " " + flat(part);
      return "(" + list + ")";
  }
}

}  // namespace

std::optional<Expression> usualReading(const std::string &text, const Expression &read,
                                       const Calc::VariableTable &variables) {
  try {
    Expression usual = UsualReader(text, variables).whole();
    if (flat(usual) == flat(read)) return std::nullopt;
    // With all brackets written out both readers agree, so this also computes the values.
    return readExpression(bracketed(usual), variables);
  } catch (const NotReadable &) {
    return std::nullopt;
  }
}

}  // namespace Plan
