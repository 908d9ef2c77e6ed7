// SPDX-License-Identifier: Apache-2.0
// Independent of the locale: a tool prints the same bytes everywhere.
#include "shared/text.h"

#include <array>
#include <cstdint>
#include <cstdio>

namespace Tools {

namespace {

struct Range {
  uint32_t first, last;
};

constexpr std::array<Range, 12> kCombining = {{{0x0300, 0x036F},
                                               {0x0483, 0x0489},
                                               {0x0591, 0x05BD},
                                               {0x0610, 0x061A},
                                               {0x064B, 0x065F},
                                               {0x093C, 0x093C},
                                               {0x0E34, 0x0E3A},
                                               {0x1AB0, 0x1AFF},
                                               {0x200B, 0x200F},
                                               {0x20D0, 0x20FF},
                                               {0xFE00, 0xFE0F},
                                               {0xFE20, 0xFE2F}}};

constexpr std::array<Range, 10> kWide = {{{0x1100, 0x115F},
                                          {0x2E80, 0x303E},
                                          {0x3041, 0xA4CF},
                                          {0xAC00, 0xD7A3},
                                          {0xF900, 0xFAFF},
                                          {0xFE30, 0xFE6F},
                                          {0xFF00, 0xFF60},
                                          {0xFFE0, 0xFFE6},
                                          {0x1F300, 0x1FAFF},
                                          {0x20000, 0x3FFFD}}};

template <size_t N>
bool isIn(const std::array<Range, N> &ranges, uint32_t point) {
  for (const Range &range : ranges) {
    if (point >= range.first && point <= range.last) return true;
  }
  return false;
}

struct Character {
  uint32_t point = 0;
  size_t length = 0;  // 0: the bytes are not UTF-8
};

bool isWellFormed(uint32_t point, size_t length) {
  constexpr std::array<uint32_t, 5> kMin = {0, 0, 0x80, 0x800, 0x10000};
  const bool surrogate = point >= 0xD800 && point <= 0xDFFF;
  return point >= kMin[length] && point <= 0x10FFFF && !surrogate;
}

Character characterAt(std::string_view text, size_t at) {
  const auto lead = static_cast<unsigned char>(text[at]);
  if (lead < 0x80) return {lead, 1};
  const size_t length = lead >= 0xF0 ? 4 : lead >= 0xE0 ? 3 : 2;
  if (lead < 0xC0 || lead > 0xF7 || length > text.size() - at) return {};
  uint32_t point = lead & (0x7FU >> length);
  for (size_t i = 1; i < length; ++i) {
    const auto byte = static_cast<unsigned char>(text[at + i]);
    if ((byte & 0xC0U) != 0x80) return {};
    point = (point << 6U) | (byte & 0x3FU);
  }
  return isWellFormed(point, length) ? Character{point, length} : Character{};
}

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
    const Character character = characterAt(text, at);
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

size_t displayWidth(std::string_view text) {
  size_t width = 0;
  for (size_t at = 0; at < text.size();) {
    const Character character = characterAt(text, at);
    at += character.length == 0 ? 1 : character.length;
    if (isIn(kCombining, character.point)) continue;
    width += isIn(kWide, character.point) ? 2 : 1;
  }
  return width;
}

std::string padded(const std::string &text, size_t columns) {
  const size_t width = displayWidth(text);
  return text + std::string(columns > width ? columns - width : 0, ' ');
}

}  // namespace Tools
