// SPDX-License-Identifier: Apache-2.0
// Texts from files and stores on a terminal: a control character in them could move the cursor,
// hide a line or add one.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace Console {

// The character at the begin of a text.
struct Character {
  size_t length;   // in bytes
  bool isControl;  // of ASCII or of Unicode's second block; a stray byte of that block too
};

// TEXT is not empty and is read as UTF-8.
Character firstCharacter(std::string_view text) noexcept;

// How many characters an escaped byte takes.
constexpr size_t kEscapeLength = 4;

// Writes BYTE as "\xHH" to TO.
void writeEscape(unsigned char byte, char *to) noexcept;

// TEXT with each byte of a control character as "\xHH".
std::string printable(std::string_view text);

}  // namespace Console
