// SPDX-License-Identifier: Apache-2.0
// Hides the differences between releases of the yaml library.
#include "yaml/node.h"

#include <type_traits>

namespace Yaml {
namespace {

// Older releases construct these errors without arguments, newer ones from a text: the requested
// key, or the path of the file.
template <typename Error>
Error errorFrom(const std::string &text) {
  if constexpr (std::is_default_constructible_v<Error>) {
    return Error();
  } else {
    return Error(text);
  }
}

bool isNullWord(const std::string &text) {
  return text == "~" || text == "null" || text == "Null" || text == "NULL";
}

// Newer releases report a null word after a tag as a scalar, quoted or not. Older ones report a
// plain one as an untagged null, so that a tagged scalar was quoted and is a text.
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
  throw errorFrom<YAML::InvalidNode>({});
}

void throwBadFile(const std::string &path) {
  throw errorFrom<YAML::BadFile>(path);
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
