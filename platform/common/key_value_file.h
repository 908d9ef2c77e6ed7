// SPDX-License-Identifier: Apache-2.0
// The one form of configuration file: `key = value` lines and `#` comments. Whatever is not plainly
// right is an error with file and line; nothing falls back to a default in silence.
#pragma once

#include <cstdint>
#include <initializer_list>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace Platform {

// what(): "FILE:LINE: text", or "FILE: text" where no line is to blame.
class ConfigError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// Rules of the form:
// - Blanks around a line, a key and a value do not count. A line is blank, a comment or `key =
// value`.
// - A comment begins with `#`, at the start of a line or after a blank, and runs to the line's end.
// - A line without `=`, an empty key or value, an unknown key and a key given twice are errors.
class KeyValueFile {
 public:
  // fileName: for the messages. Throws ConfigError.
  static KeyValueFile parse(std::string_view text, const std::string &fileName,
                            std::initializer_list<std::string_view> knownKeys);

  // The file's content; nothing when there is no such file. Throws ConfigError when it cannot be
  // read, and for what parse() refuses.
  static std::optional<KeyValueFile> read(const std::string &fileName,
                                          std::initializer_list<std::string_view> knownKeys);

  // The value of a key; nothing when the file does not give it.
  std::optional<std::string> text(std::string_view key) const;

  // The same, for a value that must be one of the choices.
  std::optional<std::string> oneOf(std::string_view key,
                                   std::initializer_list<std::string_view> choices) const;

  // The same, for a whole decimal number from min to max.
  std::optional<int64_t> integer(std::string_view key, int64_t min, int64_t max) const;

  // The same, for a path that begins at the root.
  std::optional<std::string> absolutePath(std::string_view key) const;

  // Throws the ConfigError of a key's value: "FILE:LINE: KEY: text".
  [[noreturn]] void refuse(std::string_view key, const std::string &text) const;

 private:
  struct Entry {
    std::string key, value;
    int line;
  };

  explicit KeyValueFile(std::string fileName) : fileName_(std::move(fileName)) {}
  void addLine(std::string_view line, int number, std::initializer_list<std::string_view> known);
  const Entry *find(std::string_view key) const;
  [[noreturn]] void refuseLine(int number, const std::string &text) const;

  std::string fileName_;
  std::vector<Entry> entries_;
};

}  // namespace Platform
