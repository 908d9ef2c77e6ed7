// SPDX-License-Identifier: Apache-2.0
#include "common/utf8.h"

#include <array>

namespace Platform {
namespace {

bool isWellFormed(uint32_t point, size_t length) {
  constexpr std::array<uint32_t, 5> kMinPoint = {0, 0, 0x80, 0x800, 0x10000};  // by length
  const bool isSurrogate = point >= 0xD800 && point <= 0xDFFF;
  return point >= kMinPoint[length] && point <= 0x10FFFF && !isSurrogate;
}

}  // namespace

Utf8Character utf8At(std::string_view text, size_t at) {
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
  return isWellFormed(point, length) ? Utf8Character{point, length} : Utf8Character{};
}

bool isUtf8(std::string_view text) {
  for (size_t at = 0; at < text.size();) {
    const size_t length = utf8At(text, at).length;
    if (length == 0) return false;
    at += length;
  }
  return true;
}

}  // namespace Platform
