// Levels out the differences between releases of the yaml library.
#include "calc/yaml_node.h"

#include <type_traits>

namespace Calc {
namespace {

// Older releases build the error from nothing, newer ones from the key that was asked for.
template <typename Error>
Error plainInvalidNode() {
  if constexpr (std::is_default_constructible_v<Error>) {
    return Error();
  } else {
    return Error(std::string());
  }
}

bool isNullWord(const std::string &text) {
  return text == "~" || text == "null" || text == "Null" || text == "NULL";
}

bool hasExplicitTag(const YAML::Node &node) {
  const std::string &tag = node.Tag();
  return !tag.empty() && tag != "?" && tag != "!";
}

}  // namespace

void throwInvalidNode() {
  throw plainInvalidNode<YAML::InvalidNode>();
}

void requireValid(const YAML::Node &node) {
  try {
    (void)node.Type();
  } catch (const YAML::InvalidNode &) {
    throwInvalidNode();
  }
}

// Newer releases keep a null word under a tag as a scalar, without a trace of whether it was
// quoted; older ones make it an untagged null.
bool isNull(const YAML::Node &node) {
  return node.IsNull() || (node.IsScalar() && hasExplicitTag(node) && isNullWord(node.Scalar()));
}

std::string tagOf(const YAML::Node &node) {
  return isNull(node) ? std::string() : node.Tag();
}

std::string scalarText(const YAML::Node &node) {
  requireValid(node);
  if (!node.IsScalar() || isNull(node)) {
    throw YAML::TypedBadConversion<std::string>(node.Mark());
  }
  return node.Scalar();
}

}  // namespace Calc
