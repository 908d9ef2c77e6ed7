// SPDX-License-Identifier: Apache-2.0
// The one decoder of UTF-8.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace Platform {

struct Utf8Character {
  uint32_t point = 0;
  size_t length = 0;  // in bytes; 0: the bytes are not UTF-8
};

// The character that begins at AT, which is below the text's size. Overlong forms, surrogates and
// points above U+10FFFF are not UTF-8.
Utf8Character utf8At(std::string_view text, size_t at);

bool isUtf8(std::string_view text);

}  // namespace Platform
