// SPDX-License-Identifier: Apache-2.0
// One value of a definition: why the loader refuses it, at the place in the file, and what in it
// is accepted but probably meant otherwise.
#pragma once

#include <yaml-cpp/yaml.h>

#include <string>

#include "calc/variable_table.h"
#include "plan_check/cause.h"
#include "plan_check/finding.h"
#include "plan_check/source_file.h"

namespace Plan {

// What a key's value is converted to.
enum class ValueKind { kNumber, kTruth };

// Collects the findings of one file's values.
class ValueCheck {
 public:
  // The source, the variables and the list must live as long as this object.
  ValueCheck(const SourceFile &source, const Calc::VariableTable &variables, Findings *findings)
      : source_(source), variables_(variables), findings_(findings) {}

  // Adds an error where NodeToFloat() or NodeToBool() refuses the value, else what is odd about it.
  // KEY: the node to point at when the value is a null, which has no place of its own. Returns
  // whether the value is accepted.
  bool check(const YAML::Node &key, const YAML::Node &value, ValueKind kind, Unit unit);

 private:
  struct Context {
    const YAML::Node &key;
    ValueKind kind;
    Unit unit;
    const Calc::VariableTable *siblings;  // definitions beside this one; null: none
    int depth;
  };

  bool isAccepted(const YAML::Node &value, ValueKind kind, std::string *message) const;
  void explain(const YAML::Node &value, const Context &context);
  void explainTagged(const YAML::Node &value, const std::string &tag, const Context &context);
  void explainCalc(const YAML::Node &value, const Context &context);
  void explainCalcMapping(const YAML::Node &value, const Context &context);
  void explainExpression(const YAML::Node &value, const Calc::VariableTable &variables,
                         const Calc::VariableTable *siblings);
  void explainConfig(const YAML::Node &value, const Context &context);
  void explainObject(const YAML::Node &key, const YAML::Node &value);
  void explainPlain(const YAML::Node &value, const Context &context);

  void warn(const YAML::Node &value, Unit unit, int depth);
  void warnOfExpression(const YAML::Node &value, const Calc::VariableTable &variables);
  void warnOfMapping(const YAML::Node &value, int depth);
  void warnOfReference(const YAML::Node &value, int depth);
  void warnOfNumber(const YAML::Node &value, Unit unit);

  void add(Severity severity, const Place &place, Cause cause);
  void addAt(const YAML::Node &node, const YAML::Node &key, Cause cause);

  const SourceFile &source_;
  const Calc::VariableTable &variables_;
  Findings *findings_;
  int visits_ = 0;
};

}  // namespace Plan
