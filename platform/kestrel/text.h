// SPDX-License-Identifier: Apache-2.0
// Texts for messages and reports.
#pragma once

#include <chrono>
#include <string>
#include <string_view>
#include <vector>

namespace Kestrel {

// The text with control characters, and bytes that are not UTF-8, written as \xHH: a server's words
// must not move the cursor of a terminal or begin a new line of a log. Everything else stays.
std::string escaped(std::string_view text);

// "0.68 ms"
std::string inMilliseconds(std::chrono::steady_clock::duration time);

// "2026-11-21T17:30:00Z"
std::string inUtc(std::chrono::system_clock::time_point time);

// With ", " between them.
std::string joined(const std::vector<std::string> &words);

}  // namespace Kestrel
