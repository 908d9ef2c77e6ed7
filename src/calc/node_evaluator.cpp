// SPDX-License-Identifier: Apache-2.0
// Evaluates "!calc" nodes and adds the place in the file to the faults of their expressions.
#include "calc/node_evaluator.h"

#include <string>

#include "calc/evaluator.h"
#include "calc/tagged_value.h"
#include "yaml/exception.h"
#include "yaml/node.h"

namespace Calc {
namespace {

float evaluateScalar(const YAML::Node &node, const VariableTable &variables) {
  const std::string &text = node.Scalar();
  try {
    return Evaluate(text, variables);
  } catch (const Exception &fault) {
    throw Loader::Exception(node.Mark(),
                            std::string(fault.what()) + " at '" + fault.position + "'");
  }
}

// The text is an expression whatever its tag. Unlike in evaluateScalar, a fault's message does not
// quote the rest of the text.
float evaluateResult(const YAML::Node &result, const VariableTable &variables) {
  const std::string text = Yaml::scalarText(result);
  try {
    return Evaluate(text, variables);
  } catch (const Exception &fault) {
    throw Loader::Exception(result.Mark(), fault.what());
  }
}

// A definition can use the caller's variables, but no other definition. The last entry is the
// result, whatever its key: "=" only keeps an entry out of the definitions.
float evaluateMapping(const YAML::Node &node, const VariableTable &variables) {
  VariableTable local = variables;
  YAML::Node last(YAML::NodeType::Undefined);
  bool empty = true;
  for (const auto &entry : node) {
    const std::string key = Yaml::scalarText(entry.first);
    if (key != "=") local[key] = NodeToFloat(entry.second, variables);
    last.reset(entry.second);
    empty = false;
  }
  if (empty) Yaml::throwInvalidNode();
  return evaluateResult(last, local);
}

}  // namespace

float EvaluateNode(const YAML::Node &node, const VariableTable &variables) {
  Yaml::requireValid(node);
  if (Yaml::isNull(node)) throw Loader::Exception(node.Mark(), "expected scalar or mapping");
  if (node.IsScalar()) return evaluateScalar(node, variables);
  if (node.IsMap()) return evaluateMapping(node, variables);
  throw Loader::Exception(node.Mark(), "expected scalar or mapping");
}

}  // namespace Calc
