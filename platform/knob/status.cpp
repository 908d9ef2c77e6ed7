// SPDX-License-Identifier: Apache-2.0
// Finds the text of a status; the texts themselves are in the header's table.
#include "knob/status.h"

#include <cstdio>

namespace Knob {

const char *statusText(uint32_t status) noexcept {
  for (const StatusText &row : kStatusTexts) {
    if (static_cast<uint32_t>(row.status) == status) return row.text;
  }
  thread_local std::array<char, 32> unknown;
  (void)std::snprintf(unknown.data(), unknown.size(), "unknown status 0x%08X", status);
  return unknown.data();
}

std::string_view statusName(uint32_t status) noexcept {
  const std::string_view text = statusText(status);
  return text.substr(0, text.find(": "));
}

}  // namespace Knob
