// SPDX-License-Identifier: Apache-2.0
// Three bytes are four characters; "=" fills the last four.
#include "kestrel/etcd/base64.h"

#include <array>
#include <cstdint>

namespace Kestrel::Etcd {

namespace {

constexpr std::string_view kAlphabet =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
constexpr uint8_t kNoDigit = 0xff;

constexpr std::array<uint8_t, 256> makeDigits() {
  std::array<uint8_t, 256> digits{};
  for (uint8_t &digit : digits) digit = kNoDigit;
  for (size_t i = 0; i < kAlphabet.size(); ++i) {
    digits[static_cast<unsigned char>(kAlphabet[i])] = static_cast<uint8_t>(i);
  }
  return digits;
}

constexpr std::array<uint8_t, 256> kDigits = makeDigits();

}  // namespace

std::string toBase64(std::string_view bytes) {
  std::string text;
  text.reserve((bytes.size() + 2) / 3 * 4);
  for (size_t at = 0; at < bytes.size(); at += 3) {
    const size_t count = bytes.size() - at < 3 ? bytes.size() - at : 3;
    uint32_t block = 0;
    for (size_t i = 0; i < 3; ++i) {
      block = block << 8 | (i < count ? static_cast<unsigned char>(bytes[at + i]) : 0U);
    }
    for (size_t i = 0; i < 4; ++i) {
      text += i <= count ? kAlphabet[block >> (18 - 6 * i) & 63] : '=';
    }
  }
  return text;
}

std::optional<std::string> fromBase64(std::string_view text) {
  if (text.size() % 4 != 0) return std::nullopt;
  size_t padding = 0;
  while (padding < 2 && padding < text.size() && text[text.size() - 1 - padding] == '=') ++padding;
  const size_t digits = text.size() - padding;
  std::string bytes;
  bytes.reserve(text.size() / 4 * 3);
  uint32_t bits = 0;
  int count = 0;
  for (size_t at = 0; at < digits; ++at) {
    const uint8_t digit = kDigits[static_cast<unsigned char>(text[at])];
    if (digit == kNoDigit) return std::nullopt;
    bits = (bits << 6 | digit) & 0xffffff;
    count += 6;
    if (count < 8) continue;
    count -= 8;
    bytes += static_cast<char>(bits >> count & 0xff);
  }
  return bytes;
}

}  // namespace Kestrel::Etcd
