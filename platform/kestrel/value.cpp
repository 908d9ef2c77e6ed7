// SPDX-License-Identifier: Apache-2.0
// Reading and printing of values. Nothing here depends on the locale.
#include "kestrel/value.h"

#include <array>
#include <charconv>
#include <cmath>
#include <limits>
#include <system_error>

namespace Kestrel {

namespace {

constexpr std::array<std::string_view, 4> kNames = {"integer", "real", "boolean", "text"};

bool isDigit(char c) {
  return c >= '0' && c <= '9';
}

size_t countDigits(std::string_view text, size_t from) {
  size_t end = from;
  while (end < text.size() && isDigit(text[end])) ++end;
  return end - from;
}

enum class NumberForm { kNone, kInteger, kReal };

// number = [ "+" | "-" ] ( digits [ "." [ digits ] ] | "." digits ) [ ( "e" | "E" ) [ sign ] digits
// ]
NumberForm numberForm(std::string_view text) {
  size_t at = !text.empty() && (text[0] == '+' || text[0] == '-') ? 1 : 0;
  const size_t whole = countDigits(text, at);
  at += whole;
  if (at == text.size()) return whole > 0 ? NumberForm::kInteger : NumberForm::kNone;
  size_t fraction = 0;
  if (text[at] == '.') {
    fraction = countDigits(text, at + 1);
    at += 1 + fraction;
  }
  if (whole + fraction == 0) return NumberForm::kNone;
  if (at < text.size() && (text[at] == 'e' || text[at] == 'E')) {
    ++at;
    if (at < text.size() && (text[at] == '+' || text[at] == '-')) ++at;
    const size_t exponent = countDigits(text, at);
    if (exponent == 0) return NumberForm::kNone;
    at += exponent;
  }
  return at == text.size() ? NumberForm::kReal : NumberForm::kNone;
}

ValueError unreadable(std::string_view text, const char *why) {
  return ValueError("\"" + std::string(text) + "\" " + why);
}

// from_chars takes no "+".
std::string_view withoutPlus(std::string_view text) {
  return !text.empty() && text[0] == '+' ? text.substr(1) : text;
}

Value parseInteger(std::string_view text) {
  if (numberForm(text) != NumberForm::kInteger) throw unreadable(text, "is not an integer");
  const std::string_view digits = withoutPlus(text);
  int64_t value = 0;
  const auto result = std::from_chars(digits.data(), digits.data() + digits.size(), value);
  if (result.ec != std::errc()) throw unreadable(text, "does not fit into 64 bits");
  return value;
}

Value parseReal(std::string_view text) {
  constexpr double kInfinity = std::numeric_limits<double>::infinity();
  if (text == "nan") return std::numeric_limits<double>::quiet_NaN();
  if (text == "inf") return kInfinity;
  if (text == "-inf") return -kInfinity;
  if (numberForm(text) == NumberForm::kNone) throw unreadable(text, "is not a real number");
  const std::string_view digits = withoutPlus(text);
  double value = 0;
  const auto result = std::from_chars(digits.data(), digits.data() + digits.size(), value);
  if (result.ec != std::errc()) throw unreadable(text, "is out of a real number's range");
  return value;
}

Value parseBoolean(std::string_view text) {
  if (text == "true") return true;
  if (text == "false") return false;
  throw unreadable(text, "is neither true nor false");
}

Value parseText(std::string_view text) {
  if (!isUtf8(text)) throw ValueError("the text is not UTF-8");
  return std::string(text);
}

std::string printReal(double value) {
  if (std::isnan(value)) return "nan";
  if (std::isinf(value)) return value < 0 ? "-inf" : "inf";
  std::array<char, 64> buffer{};
  const auto result = std::to_chars(buffer.data(), buffer.data() + buffer.size(), value);
  std::string text(buffer.data(), result.ptr);
  if (text.find_first_of(".e") == std::string::npos) text += ".0";
  return text;
}

// The length of the well-formed sequence that begins at AT; 0 when there is none. The bounds of the
// second byte shut out overlong forms, surrogates and everything above U+10FFFF.
size_t utf8Length(std::string_view text, size_t at) {
  const auto byte = [&](size_t index) {
    return index < text.size() ? static_cast<unsigned char>(text[index]) : 0U;
  };
  const unsigned lead = byte(at);
  if (lead < 0x80) return 1;
  const size_t length = lead >= 0xF0 ? 4 : lead >= 0xE0 ? 3 : 2;
  if (lead < 0xC2 || lead > 0xF4) return 0;
  const unsigned low = lead == 0xE0 ? 0xA0 : lead == 0xF0 ? 0x90 : 0x80;
  const unsigned high = lead == 0xED ? 0x9F : lead == 0xF4 ? 0x8F : 0xBF;
  if (byte(at + 1) < low || byte(at + 1) > high) return 0;
  for (size_t i = 2; i < length; ++i) {
    if ((byte(at + i) & 0xC0) != 0x80) return 0;
  }
  return length;
}

}  // namespace

Type typeOf(const Value &value) {
  return static_cast<Type>(value.index());
}

std::string_view typeName(Type type) {
  return kNames[static_cast<size_t>(type)];
}

std::optional<Type> typeNamed(std::string_view name) {
  for (size_t i = 0; i < kNames.size(); ++i) {
    if (kNames[i] == name) return static_cast<Type>(i);
  }
  return std::nullopt;
}

Value parseByForm(std::string_view text) {
  if (text == "true" || text == "false") return parseBoolean(text);
  switch (numberForm(text)) {
    case NumberForm::kInteger:
      return parseInteger(text);
    case NumberForm::kReal:
      return parseReal(text);
    case NumberForm::kNone:
      break;
  }
  return parseText(text);
}

Value parseAs(Type type, std::string_view text) {
  switch (type) {
    case Type::kInteger:
      return parseInteger(text);
    case Type::kReal:
      return parseReal(text);
    case Type::kBoolean:
      return parseBoolean(text);
    case Type::kText:
      break;
  }
  return parseText(text);
}

std::string print(const Value &value) {
  switch (typeOf(value)) {
    case Type::kInteger:
      return std::to_string(std::get<int64_t>(value));
    case Type::kReal:
      return printReal(std::get<double>(value));
    case Type::kBoolean:
      return std::get<bool>(value) ? "true" : "false";
    case Type::kText:
      break;
  }
  return std::get<std::string>(value);
}

bool isUtf8(std::string_view text) {
  for (size_t at = 0; at < text.size();) {
    const size_t length = utf8Length(text, at);
    if (length == 0) return false;
    at += length;
  }
  return true;
}

}  // namespace Kestrel
