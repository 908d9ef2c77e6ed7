// SPDX-License-Identifier: Apache-2.0
// Converts a value by its tag, and limits how many other values it may contain.
#include "calc/tagged_value.h"

#include <string>

#include "calc/node_evaluator.h"
#include "configref/config_reference.h"
#include "yaml/exception.h"
#include "yaml/node.h"

namespace {

// Through an alias a value can contain itself, or contain twice a value that contains twice
// another one. Without a bound the first would never end and the second take hours. Values that
// people write stay far below both bounds.
class Nesting {
 public:
  explicit Nesting(const YAML::Node &node) {
    if (depth_ == 0) conversions_ = 0;
    if (depth_ >= kMaxDepth) throw Loader::Exception(node.Mark(), "value nested too deeply");
    if (conversions_ >= kMaxConversions) {
      throw Loader::Exception(node.Mark(),
                              "more than " + std::to_string(kMaxConversions) + " values in one");
    }
    ++depth_;
    ++conversions_;
  }
  ~Nesting() { --depth_; }
  Nesting(const Nesting &) = delete;
  Nesting &operator=(const Nesting &) = delete;

 private:
  static constexpr int kMaxDepth = 500;
  static constexpr int kMaxConversions = 100000;

  // Counted per thread and not passed on: the functions between two conversions take a node and the
  // variables alone.
  static thread_local int depth_;
  static thread_local int conversions_;
};

thread_local int Nesting::depth_ = 0;
thread_local int Nesting::conversions_ = 0;

struct ToFloat {
  using Value = float;
  static float fromCalc(float value) { return value; }
  static constexpr auto fromConfig = ConfigToFloat;
};

struct ToBool {
  using Value = bool;
  static bool fromCalc(float value) { return value != 0.0F; }
  static constexpr auto fromConfig = ConfigToBool;
};

template <typename Value>
Value plainValue(const YAML::Node &node) {
  Value value{};
  if (!YAML::convert<Value>::decode(node, value)) {
    throw YAML::TypedBadConversion<Value>(node.Mark());
  }
  return value;
}

template <typename Target>
typename Target::Value convert(const YAML::Node &node, const Calc::VariableTable &variables) {
  Yaml::requireValid(node);
  const Nesting nesting(node);
  const std::string tag = Yaml::tagOf(node);
  if (tag == "!calc") return Target::fromCalc(Calc::EvaluateNode(node, variables));
  if (tag == "!config") return Target::fromConfig(node, variables);
  if (tag != "?") throw Loader::Exception(node.Mark(), "Unexpected tag " + tag);
  if (!node.IsScalar()) throw Loader::Exception(node.Mark(), "Node is not a scalar.");
  return plainValue<typename Target::Value>(node);
}

}  // namespace

float NodeToFloat(const YAML::Node &node, const Calc::VariableTable &variables) {
  return convert<ToFloat>(node, variables);
}

bool NodeToBool(const YAML::Node &node, const Calc::VariableTable &variables) {
  return convert<ToBool>(node, variables);
}
