// SPDX-License-Identifier: Apache-2.0
// The one reader of decimal numbers in texts from outside.
#pragma once

#include <charconv>
#include <optional>
#include <string_view>
#include <system_error>

namespace Platform {

// The whole text as a decimal number: digits, with a leading '-' for a signed type; no blanks and
// no '+'. Nothing for any other text and for a number that the type cannot hold.
template <typename Number>
std::optional<Number> parseNumber(std::string_view text) {
  Number number{};
  const char *end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, number);
  if (error != std::errc() || stop != end) return std::nullopt;
  return number;
}

}  // namespace Platform
