// SPDX-License-Identifier: Apache-2.0
// Reads the `key = value` form. The caller interprets keys and values.
#include "common/key_value_file.h"

#include <algorithm>
#include <system_error>

#include "common/number.h"
#include "common/read_file.h"

namespace Platform {
namespace {

constexpr std::string_view kBlanks = " \t\r";
// Far more than any sane configuration; keeps a mistaken path from filling the memory.
constexpr size_t kMaxBytes = 1 << 20;

std::string_view trimmed(std::string_view text) {
  const size_t first = text.find_first_not_of(kBlanks);
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(kBlanks) - first + 1);
}

std::string_view withoutComment(std::string_view line) {
  for (size_t at = line.find('#'); at != std::string_view::npos; at = line.find('#', at + 1)) {
    if (at == 0 || kBlanks.find(line[at - 1]) != std::string_view::npos) return line.substr(0, at);
  }
  return line;
}

std::string quoted(std::string_view text) {
  return "\"" + std::string(text) + "\"";
}

std::string listed(std::initializer_list<std::string_view> words) {
  std::string list;
  for (std::string_view word : words) {
    if (!list.empty()) list += ", ";
    list += word;
  }
  return list;
}

}  // namespace

KeyValueFile KeyValueFile::parse(std::string_view text, const std::string &fileName,
                                 std::initializer_list<std::string_view> knownKeys) {
  KeyValueFile file(fileName);
  int number = 1;
  while (!text.empty()) {
    const size_t end = text.find('\n');
    file.addLine(text.substr(0, end), number++, knownKeys);
    text.remove_prefix(end == std::string_view::npos ? text.size() : end + 1);
  }
  return file;
}

std::optional<KeyValueFile> KeyValueFile::read(const std::string &fileName,
                                               std::initializer_list<std::string_view> knownKeys) {
  std::string text;
  try {
    text = readRegularFile(fileName, kMaxBytes);
  } catch (const std::system_error &error) {
    if (error.code() == std::errc::no_such_file_or_directory) return std::nullopt;
    throw ConfigError(fileName + ": " + error.code().message());
  }
  return parse(text, fileName, knownKeys);
}

void KeyValueFile::addLine(std::string_view line, int number,
                           std::initializer_list<std::string_view> known) {
  if (line.find('\0') != std::string_view::npos) refuseLine(number, "NUL byte in the line");
  const std::string_view content = trimmed(withoutComment(line));
  if (content.empty()) return;

  const size_t equals = content.find('=');
  if (equals == std::string_view::npos) refuseLine(number, "no '=' in " + quoted(content));
  const std::string_view key = trimmed(content.substr(0, equals));
  const std::string_view value = trimmed(content.substr(equals + 1));

  if (std::find(known.begin(), known.end(), key) == known.end()) {
    refuseLine(number, "unknown key " + quoted(key) + " (known: " + listed(known) + ")");
  }
  if (value.empty()) refuseLine(number, std::string(key) + ": no value");
  if (const Entry *earlier = find(key)) {
    refuseLine(number,
               std::string(key) + ": already given in line " + std::to_string(earlier->line));
  }
  entries_.push_back({std::string(key), std::string(value), number});
}

std::optional<std::string> KeyValueFile::text(std::string_view key) const {
  const Entry *entry = find(key);
  return entry == nullptr ? std::nullopt : std::optional(entry->value);
}

std::optional<std::string> KeyValueFile::oneOf(
    std::string_view key, std::initializer_list<std::string_view> choices) const {
  std::optional<std::string> value = text(key);
  if (value && std::find(choices.begin(), choices.end(), *value) == choices.end()) {
    refuse(key, "bad value " + quoted(*value) + " (one of: " + listed(choices) + ")");
  }
  return value;
}

std::optional<int64_t> KeyValueFile::integer(std::string_view key, int64_t min, int64_t max) const {
  const Entry *entry = find(key);
  if (entry == nullptr) return std::nullopt;
  const auto number = parseNumber<int64_t>(entry->value);
  if (!number || *number < min || *number > max) {
    refuse(key, "bad value " + quoted(entry->value) + " (a whole number from " +
                    std::to_string(min) + " to " + std::to_string(max) + ")");
  }
  return number;
}

std::optional<std::string> KeyValueFile::absolutePath(std::string_view key) const {
  std::optional<std::string> value = text(key);
  if (value && value->front() != '/') {
    refuse(key, "bad value " + quoted(*value) + " (a path that begins with '/')");
  }
  return value;
}

void KeyValueFile::refuse(std::string_view key, const std::string &text) const {
  const Entry *entry = find(key);
  if (entry == nullptr) throw ConfigError(fileName_ + ": " + std::string(key) + ": " + text);
  refuseLine(entry->line, entry->key + ": " + text);
}

const KeyValueFile::Entry *KeyValueFile::find(std::string_view key) const {
  for (const Entry &entry : entries_) {
    if (entry.key == key) return &entry;
  }
  return nullptr;
}

void KeyValueFile::refuseLine(int number, const std::string &text) const {
  throw ConfigError(fileName_ + ":" + std::to_string(number) + ": " + text);
}

}  // namespace Platform
