// SPDX-License-Identifier: Apache-2.0
#include "common/process.h"

#include <unistd.h>

#include <string_view>
#include <system_error>

#include "common/number.h"
#include "common/printable.h"
#include "common/read_file.h"

namespace Platform {
namespace {

constexpr size_t kMaxBytes = size_t{64} * 1024;

std::optional<std::string> readProcessFile(int64_t pid, const char *file) {
  if (pid <= 0) return std::nullopt;
  try {
    return readFile("/proc/" + std::to_string(pid) + "/" + file, kMaxBytes);
  } catch (const std::system_error &) {
    return std::nullopt;
  }
}

// Field INDEX, counted from 0, of a line whose fields are separated by single blanks.
std::string_view field(std::string_view text, int index) {
  size_t start = text.find_first_not_of(' ');
  for (; index > 0 && start != std::string_view::npos; --index) {
    start = text.find(' ', start);
    if (start != std::string_view::npos) ++start;
  }
  if (start == std::string_view::npos) return {};
  return text.substr(start, text.find_first_of(" \n", start) - start);
}

}  // namespace

std::optional<int64_t> processStart(int64_t pid) {
  const auto stat = readProcessFile(pid, "stat");
  if (!stat) return std::nullopt;
  // "PID (NAME) STATE ...": the name may contain blanks and parentheses, so the fields are counted
  // from the last parenthesis. The state is the 3rd field of the line, the start time the 22nd.
  const size_t nameEnd = stat->rfind(')');
  if (nameEnd == std::string::npos) return std::nullopt;
  const std::string_view fields = std::string_view(*stat).substr(nameEnd + 1);
  const std::string_view state = field(fields, 0);
  if (state == "Z" || state == "X") return std::nullopt;
  constexpr int kStartField = 22 - 3;
  return parseNumber<int64_t>(field(fields, kStartField));
}

uint64_t residentBytes(int64_t pid) {
  const auto statm = readProcessFile(pid, "statm");
  if (!statm) return 0;
  const uint64_t pages = parseNumber<uint64_t>(field(*statm, 1)).value_or(0);
  return pages * static_cast<uint64_t>(::sysconf(_SC_PAGESIZE));
}

std::string processName(int64_t pid) {
  std::string name = readProcessFile(pid, "comm").value_or("");
  if (!name.empty() && name.back() == '\n') name.pop_back();
  return printable(name);
}

}  // namespace Platform
