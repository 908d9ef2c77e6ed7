// SPDX-License-Identifier: Apache-2.0
// Preloaded by a test: sends the program the signal KILL_SIGNAL just before the KILL_AT-th call
// that changes a folder or writes one to the disk.
#include <dlfcn.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

int numberOf(const char *variable) {
  const char *text = getenv(variable);
  return text == nullptr ? 0 : atoi(text);
}

void count() {
  static const int at = numberOf("KILL_AT");
  static int calls = 0;
  if (++calls == at) raise(numberOf("KILL_SIGNAL"));
}

template <typename Function>
Function *next(const char *name) {
  return reinterpret_cast<Function *>(dlsym(RTLD_NEXT, name));
}

}  // namespace

extern "C" {

int renameat(int from, const char *old, int to, const char *name) noexcept {
  count();
  return next<int(int, const char *, int, const char *)>("renameat")(from, old, to, name);
}

int linkat(int from, const char *old, int to, const char *name, int flags) noexcept {
  count();
  return next<int(int, const char *, int, const char *, int)>("linkat")(from, old, to, name, flags);
}

int unlinkat(int folder, const char *name, int flags) noexcept {
  count();
  return next<int(int, const char *, int)>("unlinkat")(folder, name, flags);
}

int fchmod(int fd, mode_t mode) noexcept {
  count();
  return next<int(int, mode_t)>("fchmod")(fd, mode);
}

int fsync(int fd) {
  count();
  return next<int(int)>("fsync")(fd);
}

}  // extern "C"
