// SPDX-License-Identifier: Apache-2.0
// Every wrong list is refused here, before a kernel sees the call.
#include "knob/param_list.h"

#include "knob/kernel.h"

namespace Knob {
namespace {

void check(bool good, const char *why) {
  if (!good) throw KernelError(Status::kBadParameter, why);
}

const KNOB_ParamList &listOf(const KNOB_ParamList *list, ListKind kind) {
  check(list != nullptr, "a list is missing");
  check(list->kind == kind, "a list is of the wrong kind");
  return *list;
}

void requireNothing(const KNOB_ParamList *list, ListKind kind) {
  if (list != nullptr)
    check(listOf(list, kind).entries.empty(), "a list has entries where none are expected");
}

const ListEntry &onlyEntry(const KNOB_ParamList *list, ListKind kind) {
  const KNOB_ParamList &checked = listOf(list, kind);
  check(checked.entries.size() == 1, "a list must have one entry");
  return checked.entries.front();
}

int64_t intOf(const ListEntry &entry) {
  const auto *value = std::get_if<int64_t>(&entry);
  check(value != nullptr, "an entry must be an integer");
  return *value;
}

std::string_view textOf(const ListEntry &entry) {
  const auto *text = std::get_if<std::string>(&entry);
  check(text != nullptr, "an entry must be a text");
  return *text;
}

}  // namespace

void requireNoInstance(const KNOB_ParamList *instance) {
  requireNothing(instance, ListKind::kInstance);
}

int64_t requireGroupId(const KNOB_ParamList *instance) {
  return intOf(onlyEntry(instance, ListKind::kInstance));
}

void requireNoInput(const KNOB_ParamList *input) {
  requireNothing(input, ListKind::kInput);
}

int64_t requireOneInt(const KNOB_ParamList *input) {
  return intOf(onlyEntry(input, ListKind::kInput));
}

std::string_view requireOneText(const KNOB_ParamList *input) {
  return textOf(onlyEntry(input, ListKind::kInput));
}

std::vector<std::string_view> requireTexts(const KNOB_ParamList *input) {
  std::vector<std::string_view> texts;
  for (const ListEntry &entry : listOf(input, ListKind::kInput).entries) {
    texts.push_back(textOf(entry));
  }
  return texts;
}

}  // namespace Knob
