// SPDX-License-Identifier: Apache-2.0
// The parameter lists of the interface, and the checks that a call makes of the ones it is given.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

#include "platform/knob.h"

namespace Knob {

enum class ListKind { kInput = 0, kInstance = 1 };

using ListEntry = std::variant<int64_t, std::string>;

}  // namespace Knob

struct KNOB_ParamList {
  Knob::ListKind kind;
  size_t capacity;
  std::vector<Knob::ListEntry> entries;
};

namespace Knob {

// What the lists of a call hold. They throw KernelError (bad parameter) for a null list, one of the
// other kind, a wrong number of entries and an entry of the wrong type.
void requireNoInstance(const KNOB_ParamList *instance);  // null, or an empty instance list
int64_t requireGroupId(const KNOB_ParamList *instance);
void requireNoInput(const KNOB_ParamList *input);  // null, or an empty input list
int64_t requireOneInt(const KNOB_ParamList *input);
std::string_view requireOneText(const KNOB_ParamList *input);
std::vector<std::string_view> requireTexts(const KNOB_ParamList *input);

}  // namespace Knob
