// SPDX-License-Identifier: Apache-2.0
// The conversions of src/calc decide. Where they refuse a value, its parts are converted one by
// one, until the parts at fault are found.
#include "plan_check/value_check.h"

#include <exception>
#include <set>
#include <utility>

#include "calc/evaluator.h"
#include "calc/tagged_value.h"
#include "plan_check/suggestion.h"
#include "yaml/node.h"

namespace Plan {
namespace {

// Through aliases a value can be its own part. Values that people write are far below this.
constexpr int kMaxDepth = 8;
constexpr int kMaxVisits = 200;

constexpr const char *kConfigShape = "a mapping with the keys object, key and default";

std::string kindOf(const YAML::Node &node) {
  if (Yaml::isNull(node)) return "nothing";
  if (node.IsMap()) return "a mapping";
  if (node.IsSequence()) return "a list";
  return "\"" + node.Scalar() + "\"";
}

bool isText(const YAML::Node &node) {
  return node.IsScalar() && !Yaml::isNull(node);
}

}  // namespace

void ValueCheck::add(Severity severity, const Place &place, Cause cause) {
  findings_->push_back({severity, std::move(cause.code), source_.path(), place, "",
                        std::move(cause.message), std::move(cause.expected),
                        std::move(cause.advice), false});
}

// At the byte of the scalar that the cause names.
void ValueCheck::addAt(const YAML::Node &node, const YAML::Node &key, Cause cause) {
  const bool text = isText(node);
  const Place place = text ? source_.placeInScalar(node.Mark(), node.Scalar(), cause.offset)
                           : source_.placeOf(Yaml::isNull(node) ? key.Mark() : node.Mark());
  add(Severity::kError, place, std::move(cause));
}

bool ValueCheck::isAccepted(const YAML::Node &value, ValueKind kind, std::string *message) const {
  try {
    if (kind == ValueKind::kTruth) {
      (void)NodeToBool(value, variables_);
    } else {
      (void)NodeToFloat(value, variables_);
    }
    return true;
  } catch (const YAML::Exception &error) {
    *message = error.msg;
  } catch (const std::exception &error) {
    *message = error.what();
  }
  return false;
}

bool ValueCheck::check(const YAML::Node &key, const YAML::Node &value, ValueKind kind, Unit unit) {
  visits_ = 0;
  std::string message;
  if (isAccepted(value, kind, &message)) {
    warn(value, unit, 0);
    return true;
  }
  const size_t before = findings_->size();
  explain(value, {key, kind, unit, nullptr, 0});
  if (findings_->size() == before) addAt(value, key, {"value", message, "", "", 0});
  return false;
}

void ValueCheck::explain(const YAML::Node &value, const Context &context) {
  if (context.depth > kMaxDepth || ++visits_ > kMaxVisits) return;
  std::string message;
  if (isAccepted(value, context.kind, &message)) return;
  const std::string tag = Yaml::tagOf(value);
  if (tag == "?") {
    explainPlain(value, context);
  } else {
    explainTagged(value, tag, context);
  }
}

void ValueCheck::explainTagged(const YAML::Node &value, const std::string &tag,
                               const Context &context) {
  if (tag == "!calc") {
    explainCalc(value, context);
  } else if (tag == "!config") {
    explainConfig(value, context);
  } else {
    const Place place = source_.placeOf(Yaml::isNull(value) ? context.key.Mark() : value.Mark());
    if (tag == "!" && source_.isOpenQuote(place)) {
      add(Severity::kError, place,
          {"quote", "a quote is not closed", "a plain value, !calc or !config", "", 0});
    } else {
      add(Severity::kError, place, tagCause(tag, isText(value) ? value.Scalar() : ""));
    }
  }
}

void ValueCheck::explainPlain(const YAML::Node &value, const Context &context) {
  if (value.IsScalar()) {
    addAt(value, context.key,
          context.kind == ValueKind::kTruth
              ? truthCause(value.Scalar(), variables_)
              : numberCause(value.Scalar(), context.unit, variables_));
    return;
  }
  Cause cause{"value", "the value is " + kindOf(value), "a plain value, !calc or !config", "", 0};
  if (value.IsMap() && value["="]) {
    cause.code = "tag";
    cause.advice = "write !calc behind the key's colon";
  } else if (value.IsMap() && (value["object"] || value["default"])) {
    cause.code = "tag";
    cause.advice = "write !config behind the key's colon";
  }
  const bool below = value.Mark().line != context.key.Mark().line;
  add(Severity::kError, source_.placeOf(below ? context.key.Mark() : value.Mark()),
      std::move(cause));
}

void ValueCheck::explainCalc(const YAML::Node &value, const Context &context) {
  if (isText(value)) {
    explainExpression(value, variables_, context.siblings);
  } else if (value.IsMap()) {
    explainCalcMapping(value, context);
  } else {
    addAt(value, context.key,
          {"empty", "!calc is followed by " + kindOf(value), "an expression, or a mapping", "", 0});
  }
}

void ValueCheck::explainCalcMapping(const YAML::Node &value, const Context &context) {
  Calc::VariableTable local = variables_;
  for (const auto &entry : value) {
    if (isText(entry.first) && entry.first.Scalar() != "=") local[entry.first.Scalar()] = 1;
  }
  YAML::Node last(YAML::NodeType::Undefined);
  YAML::Node lastKey(YAML::NodeType::Undefined);
  for (const auto &entry : value) {
    if (!isText(entry.first)) {
      addAt(entry.first, entry.first, {"key", "a name must be a text", "a name, or =", "", 0});
    } else if (entry.first.Scalar() != "=") {
      explain(entry.second,
              {entry.first, ValueKind::kNumber, Unit::kNone, &local, context.depth + 1});
    }
    last.reset(entry.second);
    lastKey.reset(entry.first);
  }
  if (value.size() == 0) {
    addAt(value, context.key,
          {"empty", "!calc is followed by an empty mapping",
           "definitions, and the expression under the key =", "", 0});
  } else if (!isText(last)) {
    addAt(last, lastKey,
          {"empty", "the last entry is " + kindOf(last), "the expression, under the key =", "", 0});
  } else {
    explainExpression(last, local, nullptr);
  }
}

void ValueCheck::explainExpression(const YAML::Node &value, const Calc::VariableTable &variables,
                                   const Calc::VariableTable *siblings) {
  const std::string &text = value.Scalar();
  try {
    (void)Calc::Evaluate(text, variables);
  } catch (const Calc::Exception &fault) {
    const auto offset = static_cast<size_t>(fault.position - text.c_str());
    Cause cause = expressionCause(text, fault.what(), offset, variables);
    const bool unknown = cause.code == "unknown-variable";
    const std::string name = unknown ? cause.message.substr(cause.message.find('"') + 1) : "";
    if (unknown && siblings != nullptr && siblings->count(name.substr(0, name.size() - 1)) > 0) {
      cause.code = "definition";
      cause.advice = "a definition does not see the others: use it in the expression under =";
    }
    const Place place = source_.placeInScalar(value.Mark(), text, cause.offset);
    const std::string_view line = source_.line(place.line);
    const auto column = static_cast<size_t>(place.column);
    const std::string_view rest = column < line.size() ? line.substr(column) : std::string_view();
    if (offset >= text.size() && rest.substr(0, 1) == ",") {
      cause.code = "comma";
      cause.message = "inside { } or [ ] a comma ends the value";
      cause.advice = "put the expression into quotes, behind !calc";
    }
    add(Severity::kError, place, std::move(cause));
  }
}

void ValueCheck::explainConfig(const YAML::Node &value, const Context &context) {
  if (!value.IsMap()) {
    addAt(value, context.key,
          {"reference", "!config is followed by " + kindOf(value), kConfigShape, "", 0});
    return;
  }
  std::set<std::string> missing = {"object", "key", "default"};
  for (const auto &entry : value) {
    if (!isText(entry.first)) {
      addAt(entry.first, entry.first, {"key", "a key must be a text", kConfigShape, "", 0});
      continue;
    }
    const std::string &name = entry.first.Scalar();
    missing.erase(name);
    if (name == "object") {
      explainObject(entry.first, entry.second);
    } else if (name == "default") {
      explain(entry.second, {entry.first, context.kind, context.unit, nullptr, context.depth + 1});
    } else if (name != "key") {
      const std::string near = closest(name, {"object", "key", "default"});
      missing.erase(near);
      addAt(entry.first, entry.first,
            {"unknown-key", "unknown key \"" + name + "\" in !config", "object, key and default",
             near.empty() ? "" : "did you mean " + near + "?", 0});
    } else if (!isText(entry.second) || entry.second.Scalar().empty()) {
      addAt(entry.second, entry.first,
            {"reference", "key is " + kindOf(entry.second), "the name of a field", "", 0});
    }
  }
  for (const std::string &name : missing) {
    addAt(value, context.key,
          {"reference", "!config without " + name, kConfigShape, "add the key " + name, 0});
  }
}

void ValueCheck::explainObject(const YAML::Node &key, const YAML::Node &value) {
  constexpr const char *kShape = "[COMPONENT, GROUP, KEY], or a mapping with these keys";
  if (isText(value)) {
    addAt(value, key, {"reference", "object is a text", kShape, "", 0});
  } else if (value.IsSequence()) {
    for (std::size_t i = 0; i < 3; ++i) {
      if (i >= value.size()) {
        addAt(
            value, key,
            {"reference", "object has " + std::to_string(value.size()) + " parts", kShape, "", 0});
        return;
      }
      if (!isText(value[i])) {
        addAt(value[i], key,
              {"reference", "a part of object is " + kindOf(value[i]), kShape, "", 0});
      }
    }
  } else if (value.IsMap()) {
    for (const auto &entry : value) {
      const std::string name = isText(entry.first) ? entry.first.Scalar() : "";
      const std::string near = closest(name, {"component", "group", "key"});
      if (name != "component" && name != "group" && name != "key") {
        addAt(entry.first, key,
              {"unknown-key", "unknown key \"" + name + "\" in object", "component, group and key",
               near.empty() ? "" : "did you mean " + near + "?", 0});
      } else if (!isText(entry.second)) {
        addAt(entry.second, entry.first,
              {"reference", name + " is " + kindOf(entry.second), "a text", "", 0});
      }
    }
  }
}

}  // namespace Plan
