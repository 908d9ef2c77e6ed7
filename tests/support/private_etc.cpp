// SPDX-License-Identifier: Apache-2.0
// FOLDER.real is the second view of the machine's /etc that the links of FOLDER point into: the
// first view is covered as soon as FOLDER is mounted.
#include "private_etc.h"

#include <fcntl.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <set>
#include <system_error>

namespace Test {
namespace {

namespace fs = std::filesystem;

fs::path realView(const fs::path &folder) {
  return folder.string() + ".real";
}

bool writeToProc(const char *path, const char *text) {
  const int file = open(path, O_WRONLY | O_CLOEXEC);
  if (file < 0) return false;
  const bool done = write(file, text, strlen(text)) == static_cast<ssize_t>(strlen(text));
  close(file);
  return done;
}

// Root may create a mount namespace; other users may within a user namespace. User and group keep
// their numbers there, so that the program does not think that it runs as root.
const char *enterNamespace() {
  const uid_t user = geteuid();
  const gid_t group = getegid();
  if (user == 0 && unshare(CLONE_NEWNS) == 0) return nullptr;
  if (unshare(CLONE_NEWUSER | CLONE_NEWNS) != 0) return "unshare";
  char map[64];
  if (!writeToProc("/proc/self/setgroups", "deny")) return "setgroups";
  snprintf(map, sizeof map, "%u %u 1", user, user);
  if (!writeToProc("/proc/self/uid_map", map)) return "uid_map";
  snprintf(map, sizeof map, "%u %u 1", group, group);
  if (!writeToProc("/proc/self/gid_map", map)) return "gid_map";
  return nullptr;
}

std::string tryPrivateEtc() {
  char name[] = "/tmp/poolctl-etc-XXXXXX";
  if (mkdtemp(name) == nullptr) return "no temporary folder";
  const fs::path folder = fs::path(name) / "etc";
  makePrivateEtc(folder);
  const pid_t pid = fork();
  if (pid == 0) {
    const char *step = enterPrivateEtc(folder);
    if (step != nullptr) fprintf(stderr, "private /etc: %s: %s\n", step, strerror(errno));
    _exit(step == nullptr ? 0 : 1);
  }
  int status = -1;
  waitpid(pid, &status, 0);
  removePrivateEtc(folder);
  fs::remove_all(name);
  if (status == 0) return {};
  return "this machine gives no private mount namespace, so /etc/rp.d can't be the test's own";
}

}  // namespace

const std::string &privateEtcUnavailable() {
  static const std::string reason = tryPrivateEtc();
  return reason;
}

void makePrivateEtc(const fs::path &folder) {
  static const std::set<std::string> own{"rp.d", "knob.conf", "kestrel.conf"};
  fs::create_directory(folder);
  fs::create_directory(realView(folder));
  for (const fs::directory_entry &entry : fs::directory_iterator("/etc")) {
    const fs::path name = entry.path().filename();
    if (own.count(name.string()) == 0) fs::create_symlink(realView(folder) / name, folder / name);
  }
}

void removePrivateEtc(const fs::path &folder) {
  // rmdir and not remove_all: if the machine's /etc were still mounted there, it would be deleted.
  if (rmdir(realView(folder).c_str()) != 0 && errno != ENOENT)
    throw std::system_error(errno, std::generic_category(), realView(folder));
}

const char *enterPrivateEtc(const fs::path &folder) {
  if (const char *step = enterNamespace()) return step;
  if (mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0) return "private mounts";
  const std::string real = realView(folder);
  if (mount("/etc", real.c_str(), nullptr, MS_BIND | MS_REC, nullptr) != 0) return "bind of /etc";
  if (mount(folder.c_str(), "/etc", nullptr, MS_BIND, nullptr) != 0) return "bind over /etc";
  return nullptr;
}

}  // namespace Test
