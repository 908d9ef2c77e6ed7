// SPDX-License-Identifier: Apache-2.0
// Reads /proc/locks. The files themselves are not opened: closing a descriptor would release the
// locks that this process holds on them.
#include "common/lock_holder.h"

#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <sstream>
#include <system_error>

#include "common/number.h"
#include "common/process.h"
#include "common/read_file.h"

namespace Platform {
namespace {

constexpr size_t kMaxBytes = size_t{4} << 20;

// The file as the list names it: "MAJOR:MINOR:INODE", the device in hexadecimal.
std::string listedName(const struct stat &status) {
  std::array<char, 64> text{};
  (void)std::snprintf(text.data(), text.size(), "%02x:%02x:%llu", major(status.st_dev),
                      minor(status.st_dev), static_cast<unsigned long long>(status.st_ino));
  return text.data();
}

// A line: "NUMBER: KIND ADVISORY READ|WRITE PID FILE FIRST LAST". One that waits has "->" behind
// its number, so that no field is where it is expected.
std::optional<int64_t> writerOf(const std::string &line, const std::string &name) {
  std::istringstream words(line);
  std::string number, kind, strictness, access, pid, file;
  words >> number >> kind >> strictness >> access >> pid >> file;
  if (access != "WRITE" || file != name) return std::nullopt;
  return parseNumber<int64_t>(pid);
}

}  // namespace

std::optional<int64_t> writeLockHolder(const std::string &file) {
  struct stat status {};
  if (::stat(file.c_str(), &status) != 0) return std::nullopt;
  try {
    std::istringstream locks(readFile("/proc/locks", kMaxBytes));
    const std::string name = listedName(status);
    for (std::string line; std::getline(locks, line);) {
      const auto pid = writerOf(line, name);
      if (pid && *pid > 0 && *pid != ::getpid()) return pid;
    }
  } catch (const std::system_error &) {  // no /proc
  }
  return std::nullopt;
}

std::string lockHolderText(std::initializer_list<std::string> files) {
  for (const std::string &file : files) {
    const auto pid = writeLockHolder(file);
    if (!pid) continue;
    const std::string name = processName(*pid);
    return "process " + std::to_string(*pid) + (name.empty() ? "" : " (" + name + ")");
  }
  return "another process";
}

}  // namespace Platform
