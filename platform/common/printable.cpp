// SPDX-License-Identifier: Apache-2.0
// Escapes what could end a line, move a cursor or reorder the text that is shown.
#include "common/printable.h"

#include <array>
#include <cstdint>
#include <cstdio>

#include "common/utf8.h"

namespace Platform {
namespace {

bool isControl(uint32_t point) {
  return point < 0x20 || (point >= 0x7F && point < 0xA0) || (point >= 0x200E && point <= 0x200F) ||
         (point >= 0x2028 && point <= 0x202E) || (point >= 0x2066 && point <= 0x2069);
}

std::string escapedByte(char byte) {
  std::array<char, 8> text{};
  (void)std::snprintf(text.data(), text.size(), "\\x%02x", static_cast<unsigned char>(byte));
  return text.data();
}

std::string escapedBytes(std::string_view bytes) {
  if (bytes == "\n") return "\\n";
  if (bytes == "\t") return "\\t";
  std::string text;
  for (const char byte : bytes) text += escapedByte(byte);
  return text;
}

}  // namespace

std::string printable(std::string_view text) {
  std::string result;
  for (size_t at = 0; at < text.size();) {
    const Utf8Character character = utf8At(text, at);
    const std::string_view bytes = text.substr(at, character.length == 0 ? 1 : character.length);
    at += bytes.size();
    if (character.length == 0 || isControl(character.point)) {
      result += escapedBytes(bytes);
    } else if (character.point == '\\') {
      result += "\\\\";
    } else {
      result += bytes;
    }
  }
  return result;
}

}  // namespace Platform
