// SPDX-License-Identifier: Apache-2.0
// Independent of the locale: a tool prints the same bytes everywhere.
#include "shared/text.h"

#include <array>
#include <cstdint>

#include "common/utf8.h"

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

}  // namespace

size_t displayWidth(std::string_view text) {
  size_t width = 0;
  for (size_t at = 0; at < text.size();) {
    const Platform::Utf8Character character = Platform::utf8At(text, at);
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
