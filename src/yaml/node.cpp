// SPDX-License-Identifier: Apache-2.0
// Hides the differences between releases of the yaml library.
#include "yaml/node.h"

#include <type_traits>

namespace Yaml {
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

// Newer releases keep a plain null word under a tag as a scalar, without a trace of whether it was
// quoted. Older ones make it an untagged null, so that what they keep was quoted and is a text.
bool keepsTaggedNulls() {
  static const bool keeps = YAML::Load("!tag ~").IsScalar();
  return keeps;
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

bool isNull(const YAML::Node &node) {
  if (node.IsNull()) return true;
  return node.IsScalar() && hasExplicitTag(node) && isNullWord(node.Scalar()) && keepsTaggedNulls();
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

}  // namespace Yaml
