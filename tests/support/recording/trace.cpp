// SPDX-License-Identifier: Apache-2.0
// Each line is written by one call, so that a program that dies leaves all earlier lines.
#include "trace.h"

#include <fcntl.h>
#include <unistd.h>

#include <cstdarg>
#include <cstdio>
#include <cstdlib>

namespace Recording {

void record(const char *variable, const std::string &line) {
  const char *path = getenv(variable);
  if (path == nullptr) return;
  const int file = open(path, O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600);
  if (file < 0) {
    perror(path);
    abort();
  }
  const std::string whole = line + "\n";
  if (write(file, whole.data(), whole.size()) != static_cast<ssize_t>(whole.size())) abort();
  close(file);
}

std::string formatted(const char *format, ...) {
  va_list arguments, again;
  va_start(arguments, format);
  va_copy(again, arguments);
  const int length = vsnprintf(nullptr, 0, format, arguments);
  va_end(arguments);
  std::string result(static_cast<size_t>(length), '\0');
  vsnprintf(result.data(), result.size() + 1, format, again);
  va_end(again);
  return result;
}

std::string quoted(const std::string &text) {
  std::string result = "\"";
  for (const char c : text) {
    if (c == '\n') {
      result += "\\n";
    } else {
      if (c == '"' || c == '\\') result += '\\';
      result += c;
    }
  }
  return result + "\"";
}

}  // namespace Recording
