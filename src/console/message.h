// SPDX-License-Identifier: Apache-2.0
// Messages on standard error. They need no memory, so that a shortage of memory can be reported,
// and throw nothing: a message that cannot be written has no other way to the user.
#pragma once

#include <cstddef>
#include <string_view>

namespace Console {

constexpr size_t kMaxParts = 8;

// Writes the parts and a line end. Where standard error is not a terminal this is one system call,
// so that the lines of processes that share a log stay whole. On a terminal control characters are
// escaped. count: at most kMaxParts.
void printParts(const std::string_view *parts, size_t count) noexcept;

template <typename... Part>
void printError(const Part &...parts) noexcept {
  static_assert(sizeof...(parts) <= kMaxParts);
  const std::string_view views[] = {parts...};
  printParts(views, sizeof...(parts));
}

// Writes a text of the program's own, which may have several lines, as it is.
void printUsage(std::string_view text) noexcept;

}  // namespace Console
