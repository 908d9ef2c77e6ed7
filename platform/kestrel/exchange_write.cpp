// SPDX-License-Identifier: Apache-2.0
// The text is written by hand: its bytes must not depend on the version of a library, and every
// code point must survive, also those that emitters replace.
#include "kestrel/exchange_write.h"

#include <array>
#include <cmath>
#include <cstdint>
#include <cstdio>

#include "kestrel/object_names.h"

namespace Kestrel {

namespace {

constexpr std::array<std::string_view, 9> kYamlWords = {"true", "false", "null", "yes", "no",
                                                        "on",   "off",   "y",    "n"};

bool isLetter(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || c == '_';
}

bool isWordCharacter(char c) {
  return isLetter(c) || (c >= '0' && c <= '9') || c == '-' || c == '.';
}

// true for a word that every reader of YAML reads as a text.
bool isPlainWord(const std::string &text) {
  if (text.empty() || !isLetter(text[0])) return false;
  std::string lower;
  for (const char c : text) {
    if (!isWordCharacter(c)) return false;
    lower += c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
  }
  for (const std::string_view word : kYamlWords) {
    if (lower == word) return false;
  }
  return true;
}

// The code point of the well-formed sequence at AT, which moves behind it.
uint32_t nextCodePoint(const std::string &text, size_t *at) {
  const auto byte = [&] { return static_cast<unsigned char>(text[(*at)++]); };
  const uint32_t lead = byte();
  if (lead < 0x80) return lead;
  const int more = lead >= 0xF0 ? 3 : lead >= 0xE0 ? 2 : 1;
  uint32_t point = lead & (0x3FU >> more);
  for (int i = 0; i < more; ++i) point = (point << 6U) | (byte() & 0x3FU);
  return point;
}

// What YAML does not allow as it is, and what would be invisible: controls, separators, the byte
// order mark, and the points that are not characters.
bool needsEscape(uint32_t point) {
  return point < 0x20 || (point >= 0x7F && point <= 0xA0) || point == 0x2028 || point == 0x2029 ||
         point == 0xFEFF || (point & 0xFFFE) == 0xFFFE || (point >= 0xFDD0 && point <= 0xFDEF);
}

std::string escaped(uint32_t point) {
  switch (point) {
    case '\n':
      return "\\n";
    case '\t':
      return "\\t";
    default:
      break;
  }
  std::array<char, 16> text{};
  const char *form = point < 0x100 ? "\\x%02X" : point < 0x10000 ? "\\u%04X" : "\\U%08X";
  (void)std::snprintf(text.data(), text.size(), form, point);
  return text.data();
}

std::string quoted(const std::string &text) {
  std::string result = "\"";
  for (size_t at = 0; at < text.size();) {
    const size_t start = at;
    const uint32_t point = nextCodePoint(text, &at);
    if (point == '"' || point == '\\') {
      result += '\\';
      result += static_cast<char>(point);
    } else if (needsEscape(point)) {
      result += escaped(point);
    } else {
      result.append(text, start, at - start);
    }
  }
  return result + "\"";
}

std::string writtenName(const std::string &name) {
  return isPlainWord(name) ? name : quoted(name);
}

std::string writtenValue(const Value &value) {
  if (const auto *text = std::get_if<std::string>(&value)) {
    (void)parseAs(Type::kText, *text);  // refuses what is not UTF-8
    return quoted(*text);
  }
  std::string printed = print(value);
  const auto *real = std::get_if<double>(&value);
  if (real == nullptr || std::isfinite(*real)) return printed;
  return printed[0] == '-' ? "-." + printed.substr(1) : "." + printed;
}

// "name: value". YAML requires "?" before a key that is longer than its readers look ahead for a
// colon.
std::string writtenField(const std::string &name, const Value &value) {
  constexpr size_t kMaxSimpleKey = 1000;
  const std::string key = writtenName(name);
  if (key.size() <= kMaxSimpleKey) return "    " + key + ": " + writtenValue(value) + "\n";
  return "    ? " + key + "\n    : " + writtenValue(value) + "\n";
}

void writeObject(const StoredObject &object, std::string *text) {
  checkId(object.id);
  *text += "- component: " + writtenName(object.id.component) + "\n";
  *text += "  group: " + writtenName(object.id.group) + "\n";
  *text += "  key: " + writtenName(object.id.key) + "\n";
  if (!object.id.extra.empty()) *text += "  extra: " + writtenName(object.id.extra) + "\n";
  *text += object.fields.empty() ? "  fields: {}\n" : "  fields:\n";
  for (const auto &[name, value] : object.fields) {
    checkFieldName(name);
    *text += writtenField(name, value);
  }
}

}  // namespace

std::string writeExchange(const std::vector<StoredObject> &objects) {
  if (objects.empty()) return "[]\n";
  std::string text;
  for (const StoredObject &object : objects) writeObject(object, &text);
  return text;
}

}  // namespace Kestrel
