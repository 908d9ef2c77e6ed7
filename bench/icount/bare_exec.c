/* SPDX-License-Identifier: Apache-2.0 */
/* What starting a program in a pool costs at the least: one write to the group's cgroup.procs, and
   execv.

   usage: bare_exec GROUP_FOLDER PROGRAM [ARGUMENT]... */
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

static int fail(const char *what) {
  fprintf(stderr, "bare_exec: %s: %s\n", what, strerror(errno));
  return 1;
}

int main(int argc, char **argv) {
  if (argc < 3) {
    fprintf(stderr, "usage: bare_exec GROUP_FOLDER PROGRAM [ARGUMENT]...\n");
    return 2;
  }
  char path[512];
  snprintf(path, sizeof path, "%s/cgroup.procs", argv[1]);
  const int descriptor = open(path, O_WRONLY | O_CLOEXEC);
  if (descriptor < 0) return fail(path);
  if (write(descriptor, "0", 1) != 1) return fail(path);
  execv(argv[2], argv + 2);
  return fail(argv[2]);
}
