// SPDX-License-Identifier: Apache-2.0
// Preloaded into a program under test. Records what the program sends to the system log, and sends
// it too. Gives the program its own clock, which starts at the second HOST_CALLS_TIME and advances
// only when the program sleeps; a sleep takes no time. The file that HOST_CALLS_UNREADABLE names
// cannot be opened, not even by root. Records the size of what is flushed to standard output.
#include <dlfcn.h>
#include <fcntl.h>
#include <stdio_ext.h>
#include <syslog.h>
#include <time.h>
#include <unistd.h>

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "trace.h"

namespace {

using Recording::formatted;
using Recording::quoted;

void note(const std::string &line) {
  Recording::record("HOST_CALLS_TRACE", line);
}

int64_t &microseconds() {
  static int64_t now = [] {
    const char *start = getenv("HOST_CALLS_TIME");
    return static_cast<int64_t>((start == nullptr ? 1000000000.0 : atof(start)) * 1e6);
  }();
  return now;
}

void pass(int64_t nanoseconds) {
  note(formatted("sleep %ld", static_cast<long>(nanoseconds / 1000)));
  microseconds() += nanoseconds / 1000;
}

int64_t nanosecondsOf(const timespec &length) {
  return static_cast<int64_t>(length.tv_sec) * 1000000000 + length.tv_nsec;
}

template <typename Function>
Function *next(const char *name) {
  return reinterpret_cast<Function *>(dlsym(RTLD_NEXT, name));
}

void logged(int priority, const char *format, va_list arguments) {
  char text[8192];
  vsnprintf(text, sizeof text, format, arguments);
  note(formatted("syslog %d ", priority) + quoted(text));
  next<void(int, const char *, ...)>("syslog")(priority, "%s", text);
}

// Whether the script makes this file unreadable; sets errno then.
bool isUnreadable(const char *path) {
  const char *unreadable = getenv("HOST_CALLS_UNREADABLE");
  if (unreadable == nullptr || strcmp(path, unreadable) != 0) return false;
  errno = EACCES;
  return true;
}

FILE *opened(const char *function, const char *path, const char *mode) {
  if (isUnreadable(path)) return nullptr;
  return next<FILE *(const char *, const char *)>(function)(path, mode);
}

int opened(const char *function, const char *path, int flags, va_list arguments) {
  if (isUnreadable(path)) return -1;
  const mode_t mode = (flags & (O_CREAT | O_TMPFILE)) == 0 ? 0 : va_arg(arguments, mode_t);
  return next<int(const char *, int, ...)>(function)(path, flags, mode);
}

}  // namespace

#pragma GCC visibility push(default)

extern "C" {

void openlog(const char *ident, int options, int facility) {
  note("openlog " + quoted(ident) + formatted(" %d %d", options, facility));
  next<void(const char *, int, int)>("openlog")(ident, options, facility);
}

void closelog() {
  note("closelog");
  next<void()>("closelog")();
}

void vsyslog(int priority, const char *format, va_list arguments) {
  logged(priority, format, arguments);
}

void syslog(int priority, const char *format, ...) {
  va_list arguments;
  va_start(arguments, format);
  logged(priority, format, arguments);
  va_end(arguments);
}

// What the two above are called in a program that was built with _FORTIFY_SOURCE.
void __vsyslog_chk(int priority, int, const char *format, va_list arguments) {
  logged(priority, format, arguments);
}

void __syslog_chk(int priority, int, const char *format, ...) {
  va_list arguments;
  va_start(arguments, format);
  logged(priority, format, arguments);
  va_end(arguments);
}

time_t time(time_t *result) noexcept {
  const time_t now = static_cast<time_t>(microseconds() / 1000000);
  if (result != nullptr) *result = now;
  return now;
}

int usleep(useconds_t length) {
  pass(static_cast<int64_t>(length) * 1000);
  return 0;
}

int nanosleep(const timespec *length, timespec *) {
  pass(nanosecondsOf(*length));
  return 0;
}

int clock_nanosleep(clockid_t, int flags, const timespec *length, timespec *) {
  if (flags != 0) abort();  // an absolute time is not supported
  pass(nanosecondsOf(*length));
  return 0;
}

int fflush(FILE *stream) {
  const size_t pending = stream == stdout ? __fpending(stream) : 0;
  if (pending != 0) note(formatted("flush %zu", pending));
  return next<int(FILE *)>("fflush")(stream);
}

FILE *fopen(const char *path, const char *mode) {
  return opened("fopen", path, mode);
}

int open(const char *path, int flags, ...) {
  va_list arguments;
  va_start(arguments, flags);
  const int result = opened("open", path, flags, arguments);
  va_end(arguments);
  return result;
}

// What open is called in a program that was built with _FORTIFY_SOURCE.
int __open_2(const char *path, int flags) {
  if (isUnreadable(path)) return -1;
  return next<int(const char *, int)>("__open_2")(path, flags);
}

// The C++ library\'s file streams use it.
FILE *fopen64(const char *path, const char *mode) {
  return opened("fopen64", path, mode);
}

}  // extern "C"

#pragma GCC visibility pop
