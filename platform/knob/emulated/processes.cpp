// SPDX-License-Identifier: Apache-2.0
// Reads /proc. A process that vanishes meanwhile is simply not there.
#include "knob/emulated/processes.h"

#include <unistd.h>

#include <charconv>
#include <string>
#include <string_view>
#include <system_error>

#include "common/read_file.h"

namespace Knob {
namespace {

constexpr size_t kMostBytes = size_t{64} * 1024;

std::optional<std::string> readProcessFile(int64_t pid, const char *file) {
  if (pid <= 0) return std::nullopt;
  try {
    return Platform::readFile("/proc/" + std::to_string(pid) + "/" + file, kMostBytes);
  } catch (const std::system_error &) {
    return std::nullopt;
  }
}

// The field of that number, counted from 0, of a text whose fields stand between single blanks.
std::string_view field(std::string_view text, int index) {
  size_t start = text.find_first_not_of(' ');
  for (; index > 0 && start != std::string_view::npos; --index) {
    start = text.find(' ', start);
    if (start != std::string_view::npos) ++start;
  }
  if (start == std::string_view::npos) return {};
  return text.substr(start, text.find_first_of(" \n", start) - start);
}

std::optional<int64_t> number(std::string_view digits) {
  int64_t value = 0;
  const auto [stop, error] = std::from_chars(digits.data(), digits.data() + digits.size(), value);
  if (error != std::errc()) return std::nullopt;
  return value;
}

}  // namespace

std::optional<int64_t> processStart(int64_t pid) {
  const auto stat = readProcessFile(pid, "stat");
  if (!stat) return std::nullopt;
  // "PID (NAME) STATE ...": the name may hold blanks and parentheses, so what follows is counted
  // from the last one. The start is the 22nd field of the line, the state the 3rd.
  const size_t nameEnd = stat->rfind(')');
  if (nameEnd == std::string::npos) return std::nullopt;
  const std::string_view fields = std::string_view(*stat).substr(nameEnd + 1);
  const std::string_view state = field(fields, 0);
  if (state == "Z" || state == "X") return std::nullopt;
  constexpr int kStartField = 22 - 3;
  return number(field(fields, kStartField));
}

uint64_t residentBytes(int64_t pid) {
  const auto statm = readProcessFile(pid, "statm");
  if (!statm) return 0;
  const auto pages = static_cast<uint64_t>(number(field(*statm, 1)).value_or(0));
  return pages * static_cast<uint64_t>(::sysconf(_SC_PAGESIZE));
}

}  // namespace Knob
