// SPDX-License-Identifier: Apache-2.0
#include "console/printable.h"

namespace Console {
namespace {

unsigned char byteAt(std::string_view text, size_t at) {
  return static_cast<unsigned char>(text[at]);
}

bool continues(unsigned char byte) {
  return (byte & 0xC0U) == 0x80;
}

// Of the sequence that a lead byte announces, in bytes.
size_t announcedLength(unsigned char lead) {
  if (lead < 0xC0) return 1;
  if (lead < 0xE0) return 2;
  return lead < 0xF0 ? 3 : 4;
}

}  // namespace

Character firstCharacter(std::string_view text) noexcept {
  const unsigned char lead = byteAt(text, 0);
  if (lead < 0x20 || (lead >= 0x7F && lead < 0xA0)) return {1, true};
  size_t length = 1;
  while (length < announcedLength(lead) && length < text.size() &&
         continues(byteAt(text, length))) {
    ++length;
  }
  return {length, lead == 0xC2 && length == 2 && byteAt(text, 1) < 0xA0};
}

void writeEscape(unsigned char byte, char *to) noexcept {
  constexpr char kDigits[] = "0123456789abcdef";
  to[0] = '\\';
  to[1] = 'x';
  to[2] = kDigits[byte >> 4U];
  to[3] = kDigits[byte & 0xFU];
}

std::string printable(std::string_view text) {
  std::string result;
  while (!text.empty()) {
    const Character character = firstCharacter(text);
    for (size_t i = 0; i < character.length; ++i) {
      char escape[kEscapeLength];
      writeEscape(byteAt(text, i), escape);
      if (character.isControl) {
        result.append(escape, sizeof escape);
      } else {
        result += text[i];
      }
    }
    text.remove_prefix(character.length);
  }
  return result;
}

}  // namespace Console
