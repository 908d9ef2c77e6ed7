// SPDX-License-Identifier: Apache-2.0
// Looks at the character where the evaluator stopped, and at what is around it.
#include <algorithm>
#include <array>
#include <cctype>
#include <vector>

#include "calc/evaluator.h"
#include "plan_check/cause.h"
#include "plan_check/suggestion.h"

namespace Plan {
namespace {

constexpr const char *kFunctions = "min(a, b), max(a, b), ceil(a)";

// The expression, and what its reader stopped at.
struct Stop {
  const std::string &text;
  const std::string &message;
  size_t offset;
  const Calc::VariableTable &variables;

  char at(size_t place) const { return place < text.size() ? text[place] : '\0'; }
  char here() const { return at(offset); }

  // The last character before that is not blank; NUL at the beginning.
  char before() const {
    size_t place = offset;
    while (place > 0 && std::isspace(static_cast<unsigned char>(text[place - 1])) != 0) --place;
    return place == 0 ? '\0' : text[place - 1];
  }

  char after() const {
    size_t place = offset + 1;
    while (std::isspace(static_cast<unsigned char>(at(place))) != 0) ++place;
    return at(place);
  }

  bool says(const char *part) const { return message.find(part) != std::string::npos; }
};

bool isDigit(char c) {
  return std::isdigit(static_cast<unsigned char>(c)) != 0;
}

bool isLetter(char c) {
  return std::isalpha(static_cast<unsigned char>(c)) != 0 || c == '_';
}

std::string nameAt(const std::string &text, size_t offset) {
  size_t end = offset;
  while (end < text.size() && (isLetter(text[end]) || isDigit(text[end]) || text[end] == '.')) {
    ++end;
  }
  return text.substr(offset, end - offset);
}

std::string lower(std::string text) {
  for (char &c : text) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return text;
}

bool isOneOf(const std::string &word, const std::vector<std::string> &words) {
  return std::find(words.begin(), words.end(), word) != words.end();
}

std::vector<std::string> namesOf(const Calc::VariableTable &variables) {
  std::vector<std::string> names;
  for (const auto &[name, value] : variables) names.push_back(name);
  std::sort(names.begin(), names.end());
  return names;
}

std::string quoted(const std::string &text) {
  return "\"" + text + "\"";
}

// What people call the facts elsewhere.
std::string adviceForName(const std::string &name, const std::vector<std::string> &known) {
  const std::string small = lower(name);
  if (isOneOf(small, {"physmb", "memmb", "rammb", "totalmb", "memorymb"})) {
    return "write physKB / 1024";
  }
  if (isOneOf(small, {"physgb", "memgb", "ramgb", "totalgb"})) return "write physKB / 1048576";
  if (isOneOf(small, {"mem", "memory", "ram", "memkb", "totalmem", "memtotal", "phys", "total"})) {
    return "did you mean physKB?";
  }
  if (isOneOf(small, {"cpus", "cpu", "ncpu", "ncpus", "numcpus", "numcpu", "cores", "nproc",
                      "numcores"})) {
    return "did you mean numPCPUs?";
  }
  const std::string near = closest(name, known);
  return near.empty() ? "" : "did you mean " + near + "?";
}

Cause unknownName(const Stop &stop) {
  const std::string name = nameAt(stop.text, stop.offset);
  const std::string small = lower(name);
  if (isOneOf(small, {"true", "false", "yes", "no", "on", "off"})) {
    return {"truth-word", quoted(name) + " is not a value in an expression", "1 or 0",
            small == "true" || small == "yes" || small == "on" ? "write 1" : "write 0",
            stop.offset};
  }
  if (small != name && isOneOf(small, {"min", "max", "ceil", "not", "and", "or", "if", "else"})) {
    return {"case", quoted(name) + " is not known: words of the language are in lower case", "",
            "write " + small, stop.offset};
  }
  size_t next = stop.offset + name.size();
  while (std::isspace(static_cast<unsigned char>(stop.at(next))) != 0) ++next;
  if (stop.at(next) == '(') {
    const std::string near = closest(name, {"min", "max", "ceil"});
    return {"unknown-function", "unknown function " + quoted(name), kFunctions,
            near.empty() ? "" : "did you mean " + near + "?", stop.offset};
  }
  const std::vector<std::string> known = namesOf(stop.variables);
  return {"unknown-variable", "unknown variable " + quoted(name), "one of " + joined(known),
          adviceForName(name, known), stop.offset};
}

// The text with the words True and False replaced by 1 and 0, where they are not variables.
std::string withoutTruthWords(const Stop &stop, size_t *first) {
  std::string text;
  for (size_t at = 0; at < stop.text.size();) {
    const std::string name = isLetter(stop.text[at]) ? nameAt(stop.text, at) : "";
    const bool isWord = (name == "True" || name == "False") && stop.variables.count(name) == 0;
    if (isWord && *first == std::string::npos) *first = at;
    text += isWord ? (name == "True" ? "1" : "0") : name.empty() ? stop.text.substr(at, 1) : name;
    at += name.empty() ? 1 : name.size();
  }
  return text;
}

std::optional<Cause> truthWords(const Stop &stop) {
  size_t first = std::string::npos;
  const std::string replaced = withoutTruthWords(stop, &first);
  if (first == std::string::npos) return std::nullopt;
  try {
    (void)Calc::Evaluate(replaced, stop.variables);
  } catch (const Calc::Exception &) {
    return std::nullopt;
  }
  return Cause{"truth-word", quoted(nameAt(stop.text, first)) + " is of no use in an expression",
               "1 or 0", "write " + replaced, first};
}

Cause atEnd(const Stop &stop) {
  if (stop.text.empty()) return {"empty", "the expression is empty", "an expression", "", 0};
  if (stop.says("expected )")) {
    return {"bracket", "a bracket is not closed", "\")\"", "", stop.offset};
  }
  if (stop.says("expected ,")) {
    return {"arguments", stop.message.substr(0, 3) + " takes two arguments", kFunctions, "",
            stop.offset};
  }
  if (stop.says("expected (")) {
    return {"arguments", "a function has no arguments", kFunctions, "", stop.offset};
  }
  return {"operand", "the expression ends where a value is missing",
          "a number, a variable or \"(\"", "", stop.offset};
}

std::optional<Cause> atSign(const Stop &stop) {
  const char here = stop.here();
  if (here == '=' || here == '<' || here == '>' || here == '!') {
    return Cause{"comparison", "there are no comparisons in expressions",
                 "one of the operators + - * / and or not if else",
                 "use min, max or a fact that is 0 or 1", stop.offset};
  }
  if (here == '%') {
    return Cause{"percent", "\"%\" is not an operator", "one of the operators + - * /",
                 "10 percent of x is x / 10", stop.offset};
  }
  if (here == '^' || (here == '*' && stop.before() == '*')) {
    return Cause{"power", "there is no operator for powers", "one of the operators + - * /", "",
                 stop.offset};
  }
  if (here == '&' || here == '|') {
    return Cause{"logical-sign", "\"" + std::string(1, here) + "\" is not an operator",
                 "and, or, not", here == '&' ? "write and" : "write or", stop.offset};
  }
  if (here == '?' || here == ':') {
    return Cause{"choice", "\"" + std::string(1, here) + "\" is not an operator",
                 "VALUE if CONDITION else OTHER", "", stop.offset};
  }
  if (here == '$' || here == '{' || here == '}' || here == '[' || here == '\'' || here == '"') {
    return Cause{"template", "\"" + std::string(1, here) + "\" is not part of an expression",
                 "variables by their bare names, such as physKB", "", stop.offset};
  }
  return std::nullopt;
}

Cause atComma(const Stop &stop) {
  if (isDigit(stop.before()) && isDigit(stop.at(stop.offset + 1)) &&
      stop.text.find('(') == std::string::npos) {
    return {"decimal-comma", "\",\" is not part of a number", "digits, with \".\" for a fraction",
            "leave the comma out, or write \".\"", stop.offset};
  }
  if (stop.says("ceil")) {
    return {"arguments", "ceil takes one argument", kFunctions, "", stop.offset};
  }
  if (stop.says("min") || stop.says("max")) {
    return {"arguments", stop.message.substr(0, 3) + " takes two arguments", kFunctions,
            "nest the calls: min(a, min(b, c))", stop.offset};
  }
  return {"arguments", "\",\" is only known between the arguments of min and max", kFunctions, "",
          stop.offset};
}

Cause atOperand(const Stop &stop) {
  const std::string name = isLetter(stop.here()) ? nameAt(stop.text, stop.offset) : "";
  if (name == "else") {
    return {"condition", "\"else\" without \"if\": the condition of \"if\" is one operand only",
            "VALUE if CONDITION else OTHER", "put the condition in brackets", stop.offset};
  }
  if (stop.offset > 0 && isDigit(stop.text[stop.offset - 1]) && !name.empty()) {
    if (name[0] == '_') {
      return {"digit-group", "\"_\" is not part of a number", "digits", "leave it out",
              stop.offset};
    }
    return {"unit", "a number has no unit: " + quoted(name) + " follows it",
            "numbers without a unit; a result for memory is in MB", "", stop.offset};
  }
  if (isDigit(stop.before()) && isDigit(stop.here())) {
    return {"digit-group", "a blank is not part of a number", "digits, or an operator",
            "leave the blank out", stop.offset};
  }
  return {"operator", "an operator is missing before \"" + stop.text.substr(stop.offset) + "\"",
          "one of + - * / and or if", "", stop.offset};
}

std::optional<Cause> missingOperand(const Stop &stop) {
  const char here = stop.here();
  const char after = stop.after();
  if (here == '-' && (isLetter(after) || after == '(')) {
    return Cause{"minus", "\"-\" before a name or a bracket is not known", "a number or a name",
                 "write 0 - x, in brackets behind another operator", stop.offset};
  }
  if (here == ')' || here == ',') {
    return Cause{"operand", "a value is missing before \"" + std::string(1, here) + "\"",
                 "a number, a variable or \"(\"", "", stop.offset};
  }
  if (std::isspace(static_cast<unsigned char>(here)) != 0) {
    return Cause{"blank", "the expression begins with a blank", "a value at once",
                 "remove the blank behind the quote", stop.offset};
  }
  return std::nullopt;
}

}  // namespace

Cause expressionCause(const std::string &text, const std::string &message, size_t offset,
                      const Calc::VariableTable &variables) {
  const Stop stop{text, message, offset, variables};
  if (auto cause = truthWords(stop)) return *cause;
  if (stop.says("unexpected symbol")) return unknownName(stop);
  if (offset >= text.size()) return atEnd(stop);
  if (auto cause = atSign(stop)) return *cause;
  if (stop.here() == ',' && !stop.says("Missing")) return atComma(stop);
  if (stop.says("Missing")) {
    if (auto cause = missingOperand(stop)) return *cause;
  } else if (isLetter(stop.here()) || isDigit(stop.here()) || stop.here() == '(') {
    return atOperand(stop);
  }
  if (stop.here() == ')' && stop.says("unexpected char")) {
    return {"bracket", "a bracket is closed that was not opened", "the end", "", offset};
  }
  if (stop.here() == ')' && stop.says("expected ,")) {
    return {"arguments", message.substr(0, 3) + " takes two arguments", kFunctions, "", offset};
  }
  return {"expression", message, "", "", offset};
}

}  // namespace Plan
