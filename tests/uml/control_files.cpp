// SPDX-License-Identifier: Apache-2.0
#include "control_files.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <fstream>
#include <sstream>
#include <stdexcept>
#include <system_error>
#include <thread>
#include <utility>

namespace Uml {
namespace {

namespace fs = std::filesystem;

[[noreturn]] void fail(const fs::path &path) {
  throw std::system_error(errno, std::generic_category(), path);
}

void killMembers(const std::string &path) {
  std::istringstream pids(readControl(path, "cgroup.procs"));
  for (pid_t pid = 0; pids >> pid;) kill(pid, SIGKILL);
}

// The kernel says "busy" until the last dead process has left, which nothing announces.
void removeWhenEmpty(const std::string &path) {
  const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(20);
  while (rmdir((kMount / path).c_str()) != 0) {
    if (errno != EBUSY || std::chrono::steady_clock::now() > end) fail(path);
    killMembers(path);
    std::this_thread::sleep_for(std::chrono::milliseconds(5));
  }
}

}  // namespace

std::string readControl(const std::string &path, const std::string &file) {
  const fs::path name = kMount / path / file;
  const int descriptor = open(name.c_str(), O_RDONLY | O_CLOEXEC);
  if (descriptor < 0) fail(name);
  std::string content;
  char buffer[4096];
  ssize_t count = 0;
  while ((count = read(descriptor, buffer, sizeof buffer)) > 0)
    content.append(buffer, static_cast<size_t>(count));
  const int error = errno;
  close(descriptor);
  if (count < 0) throw std::system_error(error, std::generic_category(), name);
  if (!content.empty() && content.back() == '\n') content.pop_back();
  return content;
}

int64_t numberIn(const std::string &path, const std::string &file) {
  const std::string text = readControl(path, file);
  return text == "max" ? kMax : std::stoll(text);
}

int64_t numberIn(const std::string &path, const std::string &file, const std::string &key) {
  std::istringstream lines(readControl(path, file));
  std::string name;
  for (int64_t number = 0; lines >> name >> number;)
    if (name == key) return number;
  return 0;
}

void writeControl(const std::string &path, const std::string &file, const std::string &text) {
  const fs::path name = kMount / path / file;
  const int descriptor = open(name.c_str(), O_WRONLY | O_CLOEXEC);
  if (descriptor < 0) fail(name);
  const ssize_t count = write(descriptor, text.data(), text.size());
  const int error = errno;
  close(descriptor);
  if (count != static_cast<ssize_t>(text.size()))
    throw std::system_error(error, std::generic_category(), name);
}

bool groupExists(const std::string &path) {
  return fs::is_directory(kMount / path);
}

std::vector<std::string> allGroups() {
  std::vector<std::string> groups;
  for (const auto &entry : fs::recursive_directory_iterator(kMount))
    if (entry.is_directory()) groups.push_back(fs::relative(entry.path(), kMount).string());
  std::sort(groups.begin(), groups.end());
  return groups;
}

int64_t oomKills() {
  int64_t kills = 0;
  for (const std::string &group : allGroups())
    kills += numberIn(group, "memory.events.local", "oom_kill");
  return kills;
}

void removeGroups(const std::vector<std::string> &keep) {
  std::vector<std::string> groups = allGroups();
  std::reverse(groups.begin(), groups.end());
  for (const std::string &group : groups) killMembers(group);
  for (const std::string &group : groups)
    if (std::find(keep.begin(), keep.end(), group) == keep.end()) removeWhenEmpty(group);
}

void startTreeAnew() {
  removeGroups(kFixedGroups);
  for (const std::string &group : kFixedGroups) {
    if (!groupExists(group)) continue;
    removexattr((kMount / group).c_str(), "user.knob");
    for (const auto &[file, text] : {std::pair("memory.min", "0"), std::pair("memory.max", "max"),
                                     std::pair("cpu.max", "max"), std::pair("cpu.weight", "100")})
      writeControl(group, file, text);
  }
}

}  // namespace Uml
