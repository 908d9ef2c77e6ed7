// SPDX-License-Identifier: Apache-2.0
// The two functions stand before the C library's own, and make the same system calls.
#include "interrupted_calls.h"

#include <sys/syscall.h>
#include <sys/types.h>
#include <unistd.h>

#include <cerrno>
#include <utility>

namespace {

std::function<void()> attributeAct, writeAct, everyWriteAct;
int writesUntilFailure = 0;

void actOnce(std::function<void()> &waiting) {
  if (const auto act = std::exchange(waiting, nullptr)) act();
}

}  // namespace

namespace InterruptedCalls {

void beforeNextAttribute(std::function<void()> act) {
  attributeAct = std::move(act);
}

void beforeNextWrite(std::function<void()> act) {
  writeAct = std::move(act);
}

void beforeEveryWrite(std::function<void()> act) {
  everyWriteAct = std::move(act);
}

void failWrite(int nth) {
  writesUntilFailure = nth;
}

}  // namespace InterruptedCalls

extern "C" int fsetxattr(int file, const char *name, const void *value, size_t size,
                         int flags) noexcept {
  actOnce(attributeAct);
  return static_cast<int>(::syscall(SYS_fsetxattr, file, name, value, size, flags));
}

extern "C" ssize_t pwrite(int file, const void *data, size_t size, off_t offset) {
  actOnce(writeAct);
  if (everyWriteAct) everyWriteAct();
  if (writesUntilFailure > 0 && --writesUntilFailure == 0) {
    errno = EIO;
    return -1;
  }
  return ::syscall(SYS_pwrite64, file, data, size, offset);
}
