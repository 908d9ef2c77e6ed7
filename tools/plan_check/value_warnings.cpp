// SPDX-License-Identifier: Apache-2.0
// What is odd about a value that the loader accepts.
#include <cctype>
#include <cmath>
#include <cstdlib>
#include <map>
#include <set>
#include <utility>

#include "calc/evaluator.h"
#include "calc/tagged_value.h"
#include "plan_check/expression.h"
#include "plan_check/grouping.h"
#include "plan_check/value_check.h"
#include "yaml/node.h"

namespace Plan {
namespace {

// A single-precision number holds every integer up to this one.
constexpr double kMaxExactInteger = 16777216;

constexpr int kMaxDepth = 8;
constexpr int kMaxVisits = 200;

void addNames(const Expression &expression, std::set<std::string> *names) {
  if (expression.kind == Expression::Kind::kVariable) names->insert(expression.text);
  for (const Expression &part : expression.parts) addNames(part, names);
}

}  // namespace

void ValueCheck::warn(const YAML::Node &value, Unit unit, int depth) {
  if (depth > kMaxDepth || ++visits_ > kMaxVisits) return;
  const std::string tag = Yaml::tagOf(value);
  if (tag == "!config") {
    warnOfReference(value, depth);
  } else if (tag == "?") {
    warnOfNumber(value, unit);
  } else if (value.IsMap()) {
    warnOfMapping(value, depth);
  } else {
    warnOfExpression(value, variables_);
  }
}

void ValueCheck::warnOfExpression(const YAML::Node &value, const Calc::VariableTable &variables) {
  const std::string &text = value.Scalar();
  const std::optional<Expression> read = readExpression(text, variables);
  if (!read) return;
  const std::optional<Expression> usual = usualReading(text, *read, variables);
  if (!usual) return;
  add(Severity::kWarning, source_.placeInScalar(value.Mark(), text, 0),
      {"grouping", "this is " + bracketed(*read) + ", which comes to " + numberText(read->value),
       "",
       "most readers take it for " + bracketed(*usual) + ", " + numberText(usual->value) +
           ": write the brackets of the one that you mean",
       0});
}

void ValueCheck::warnOfMapping(const YAML::Node &value, int depth) {
  Calc::VariableTable local = variables_;
  std::map<std::string, YAML::Node> definitions;
  YAML::Node last(YAML::NodeType::Undefined);
  YAML::Node lastKey(YAML::NodeType::Undefined);
  YAML::Node equals(YAML::NodeType::Undefined);
  for (const auto &entry : value) {
    const std::string name = entry.first.Scalar();
    if (name == "=") {
      equals.reset(entry.first);
    } else {
      warn(entry.second, Unit::kNone, depth + 1);
      local[name] = 1;
      if (!definitions.emplace(name, entry.first).second) {
        add(Severity::kWarning, source_.placeOf(entry.first.Mark()),
            {"key-twice", "\"" + name + "\" is defined twice; the last value counts", "", "", 0});
      }
    }
    last.reset(entry.second);
    lastKey.reset(entry.first);
  }
  if (lastKey.Scalar() != "=") {
    const bool ignored = equals.IsDefined();
    add(Severity::kWarning, source_.placeOf(ignored ? equals.Mark() : lastKey.Mark()),
        {"result",
         ignored ? "the last entry is the result, so that this one is ignored"
                 : "the last entry is the result, whatever its name",
         "the expression as the last entry, under the key =", "", 0});
    return;
  }
  const std::optional<Expression> read = readExpression(last.Scalar(), local);
  std::set<std::string> used;
  if (read) addNames(*read, &used);
  for (const auto &[name, key] : definitions) {
    if (used.count(name) > 0) continue;
    add(Severity::kWarning, source_.placeOf(key.Mark()),
        {"unused", "the expression does not use \"" + name + "\"", "", "", 0});
  }
  warnOfExpression(last, local);
}

void ValueCheck::warnOfReference(const YAML::Node &value, int depth) {
  std::set<std::string> seen;
  for (const auto &entry : value) {
    const std::string name = entry.first.Scalar();
    if (!seen.insert(name).second) {
      add(Severity::kWarning, source_.placeOf(entry.first.Mark()),
          {"key-twice", "\"" + name + "\" is given twice; the last value counts", "", "", 0});
    }
    if (name == "default") warn(entry.second, Unit::kNone, depth + 1);
    if (name != "object") continue;
    const YAML::Node &object = entry.second;
    if (object.IsSequence() && object.size() > 3) {
      add(Severity::kWarning, source_.placeOf(object[3].Mark()),
          {"reference", "object has more than three parts; the rest is ignored",
           "[COMPONENT, GROUP, KEY]", "", 0});
    }
    if (object.IsSequence()) continue;
    std::string missing;
    for (const char *const part : {"component", "group", "key"}) {
      if (!object.IsMap() || !object[part]) {
        missing += (missing.empty() ? "" : ", ") + std::string(part);
      }
    }
    if (missing.empty()) continue;
    add(Severity::kWarning, source_.placeOf(entry.first.Mark()),
        {"reference", "object does not give: " + missing, "component, group and key", "", 0});
  }
}

void ValueCheck::warnOfNumber(const YAML::Node &value, Unit unit) {
  const std::string &text = value.Scalar();
  char *end = nullptr;
  const double exact = std::strtod(text.c_str(), &end);
  const Place place = source_.placeOf(value.Mark());
  const bool number = end != text.c_str() && std::isfinite(exact);
  if (!number) return;
  const size_t first = text.find_first_not_of("+-");
  const bool leadingZero = first != std::string::npos && text[first] == '0' &&
                           first + 1 < text.size() &&
                           std::isdigit(static_cast<unsigned char>(text[first + 1])) != 0;
  if (leadingZero) {
    add(Severity::kWarning, place,
        {"base",
         "a leading zero does not make the number octal: this is " +
             numberText(static_cast<float>(exact)),
         "", "leave the zero out", 0});
  }
  const auto stored = static_cast<double>(static_cast<float>(exact));
  if (std::fabs(exact) > kMaxExactInteger && stored != exact) {
    add(Severity::kWarning, place,
        {"rounding",
         "numbers above 16777216 are rounded: this becomes " +
             numberText(static_cast<float>(exact)),
         "", "", 0});
  }
  const bool cut = unit != Unit::kNone && std::trunc(exact) != exact;
  if (cut) {
    const std::string whole = numberText(static_cast<float>(std::trunc(exact)));
    const char *const units = unit == Unit::kMemoryMB     ? " MB"
                              : unit == Unit::kCpuPercent ? " percent of one CPU"
                                                          : "";
    add(Severity::kWarning, place,
        {"fraction", "the fraction is cut off: this becomes " + whole + units, "", "", 0});
  }
}

}  // namespace Plan
