// SPDX-License-Identifier: Apache-2.0
// Independent of the locale. C1 control characters are the two bytes C2 80 to C2 9F in UTF-8.
#include "kestrel/text.h"

#include <array>
#include <cstdio>
#include <ctime>

#include "kestrel/value.h"

namespace Kestrel {

namespace {

void appendEscaped(unsigned char byte, std::string *text) {
  constexpr const char *kHex = "0123456789ABCDEF";
  *text += {'\\', 'x', kHex[byte >> 4], kHex[byte & 15]};
}

}  // namespace

std::string escaped(std::string_view text) {
  const bool utf8 = isUtf8(text);
  std::string result;
  result.reserve(text.size());
  for (size_t at = 0; at < text.size(); ++at) {
    const auto byte = static_cast<unsigned char>(text[at]);
    const bool c1 = utf8 && byte == 0xC2 && static_cast<unsigned char>(text[at + 1]) < 0xA0;
    if (c1) appendEscaped(byte, &result);
    if (c1) ++at;
    const auto last = static_cast<unsigned char>(text[at]);
    const bool control = last < 0x20 || last == 0x7F;
    if (c1 || control || (!utf8 && last >= 0x80)) {
      appendEscaped(last, &result);
    } else {
      result += text[at];
    }
  }
  return result;
}

std::string inMilliseconds(std::chrono::steady_clock::duration time) {
  std::array<char, 64> text{};
  const double value = std::chrono::duration<double, std::milli>(time).count();
  (void)std::snprintf(text.data(), text.size(), "%.2f ms", value);
  return text.data();
}

std::string inUtc(std::chrono::system_clock::time_point time) {
  const std::time_t seconds = std::chrono::system_clock::to_time_t(time);
  std::tm parts{};
  std::array<char, 64> text{};
  if (gmtime_r(&seconds, &parts) == nullptr) return std::to_string(seconds);
  (void)std::strftime(text.data(), text.size(), "%Y-%m-%dT%H:%M:%SZ", &parts);
  return text.data();
}

std::string joined(const std::vector<std::string> &words) {
  std::string text;
  for (const std::string &word : words) text += (text.empty() ? "" : ", ") + word;
  return text;
}

}  // namespace Kestrel
