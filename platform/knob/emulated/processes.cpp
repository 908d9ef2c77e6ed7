// Reads /proc. A process that vanishes meanwhile is simply not there.
#include "knob/emulated/processes.h"

#include <unistd.h>

#include <sstream>
#include <string>
#include <system_error>

#include "common/read_file.h"

namespace Knob {
namespace {

constexpr size_t kMostBytes = 64 * 1024;

std::optional<std::string> readProcessFile(int64_t pid, const char *file) {
  if (pid <= 0) return std::nullopt;
  try {
    return Platform::readFile("/proc/" + std::to_string(pid) + "/" + file, kMostBytes);
  } catch (const std::system_error &) {
    return std::nullopt;
  }
}

}  // namespace

std::optional<int64_t> processStart(int64_t pid) {
  const auto stat = readProcessFile(pid, "stat");
  if (!stat) return std::nullopt;
  // "PID (NAME) STATE ...": the name may hold blanks and parentheses, so what follows is counted
  // from the last one. The start is the 22nd field of the line.
  const size_t nameEnd = stat->rfind(')');
  if (nameEnd == std::string::npos) return std::nullopt;
  std::istringstream fields(stat->substr(nameEnd + 1));
  std::string state, skipped;
  fields >> state;
  if (state == "Z" || state == "X") return std::nullopt;
  constexpr int kFieldsBetween = 18;
  for (int i = 0; i < kFieldsBetween; ++i) fields >> skipped;
  int64_t start = 0;
  if (!(fields >> start)) return std::nullopt;
  return start;
}

uint64_t residentBytes(int64_t pid) {
  const auto statm = readProcessFile(pid, "statm");
  if (!statm) return 0;
  std::istringstream fields(*statm);
  uint64_t size = 0, residentPages = 0;
  if (!(fields >> size >> residentPages)) return 0;
  return residentPages * static_cast<uint64_t>(::sysconf(_SC_PAGESIZE));
}

}  // namespace Knob
