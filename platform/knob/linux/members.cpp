// SPDX-License-Identifier: Apache-2.0
// cgroup.procs holds one living process a line; zombies are left out by Linux itself.
#include "knob/linux/members.h"

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <limits>
#include <string>
#include <system_error>

#include "common/read_file.h"
#include "knob/linux/errno_status.h"

namespace Knob::Linux {
namespace {

constexpr size_t kMostBytes = 4096;

// The kernel takes a zombie without a word, and leaves it where it is.
bool isAlive(const std::string &pid) {
  try {
    const std::string stat = Platform::readFile("/proc/" + pid + "/stat", kMostBytes);
    // "PID (NAME) STATE ...": the name may hold parentheses too.
    const size_t state = stat.rfind(") ") + 2;
    return state < stat.size() && stat[state] != 'Z' && stat[state] != 'X';
  } catch (const std::system_error &) {
    return false;
  }
}

}  // namespace

std::vector<int64_t> parseMembers(std::string_view text) {
  std::vector<int64_t> pids;
  for (size_t start = 0; start < text.size();) {
    const size_t end = std::min(text.find('\n', start), text.size());
    int64_t pid = 0;
    const auto [stop, error] = std::from_chars(text.data() + start, text.data() + end, pid);
    // A process outside our process-id space is written as 0, which would name ourselves.
    if (error == std::errc() && stop == text.data() + end && pid > 0) pids.push_back(pid);
    start = end + 1;
  }
  return pids;
}

std::vector<int64_t> readMembers(const Group &group) {
  return parseMembers(readControl(group.directory, kMembersFile));
}

void addMember(Group &group, int64_t pid) {
  // 0 would be this process itself.
  if (pid <= 0 || pid > std::numeric_limits<int32_t>::max()) {
    throw KernelError(Status::kNotFound, "no such process");
  }
  const std::string text = std::to_string(pid);
  int error = writeControl(group.directory, kMembersFile, text);
  if (error == EBUSY) {
    // Its last child group is gone, but it still passes its controllers on.
    error = writeControl(group.directory, kSubtreeFile, kTakeBack);
    if (error == 0) {
      group.passesOn = false;
      error = writeControl(group.directory, kMembersFile, text);
    }
  }
  if (error != 0) fail(error, "cannot move process " + text);
  if (!isAlive(text)) throw KernelError(Status::kNotFound, "no such process");
}

}  // namespace Knob::Linux
