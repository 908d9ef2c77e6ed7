// SPDX-License-Identifier: Apache-2.0
// Texts from outside, made safe for one line of a terminal or a log.
#pragma once

#include <string>
#include <string_view>

namespace Platform {

// The text with control characters, backslashes and bytes that are not UTF-8 escaped: "\t", "\n",
// "\\", and "\xHH" for each other byte. Different texts stay different.
std::string printable(std::string_view text);

}  // namespace Platform
