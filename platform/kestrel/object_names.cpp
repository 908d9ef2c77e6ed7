// SPDX-License-Identifier: Apache-2.0
// Checks of names, made before a store is touched.
#include "kestrel/object_names.h"

namespace Kestrel {

namespace {

void checkName(const char *what, const std::string &name) {
  if (!isUtf8(name)) throw ValueError(std::string("the ") + what + " is not UTF-8");
  if (name.find('\0') != std::string::npos) {
    throw ValueError(std::string("the ") + what + " holds a NUL");
  }
}

}  // namespace

void checkId(const ObjectId &id) {
  checkName("component", id.component);
  checkName("group", id.group);
  checkName("key", id.key);
  checkName("extra text", id.extra);
}

void checkFieldName(const std::string &name) {
  checkName("field's name", name);
  if (name.empty()) throw ValueError("the field's name is empty");
}

std::string describe(const ObjectId &id) {
  std::string text = id.component + "/" + id.group + "/" + id.key;
  if (!id.extra.empty()) text += "/" + id.extra;
  return text;
}

}  // namespace Kestrel
