/* SPDX-License-Identifier: Apache-2.0 */
/* What making pools costs at the least: for each a mkdir and a write to each of its four control
   files, and nothing else. The values are those of the definitions of pools.cpp. And what removing
   them costs at the least: an rmdir each.

   usage: bare_groups make|remove FOLDER COUNT */
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

static void fail(const char *what) {
  fprintf(stderr, "bare_groups: %s: %s\n", what, strerror(errno));
  exit(1);
}

static void put(const char *group, const char *file, const char *text) {
  char path[512];
  snprintf(path, sizeof path, "%s/%s", group, file);
  const int descriptor = open(path, O_WRONLY | O_CLOEXEC);
  if (descriptor < 0) fail(path);
  if (write(descriptor, text, strlen(text)) != (ssize_t)strlen(text)) fail(path);
  close(descriptor);
}

static void make(const char *group, int number) {
  if (mkdir(group, 0755) != 0) fail(group);
  put(group, "memory.min", number % 8 == 0 ? "1048576" : "0");
  put(group, "memory.max", "67108864");
  put(group, "cpu.max", "50000 100000");
  put(group, "cpu.weight", "200");
}

int main(int argc, char **argv) {
  const int makes = argc == 4 && strcmp(argv[1], "make") == 0;
  if (!makes && !(argc == 4 && strcmp(argv[1], "remove") == 0)) {
    fprintf(stderr, "usage: bare_groups make|remove FOLDER COUNT\n");
    return 2;
  }
  const int count = atoi(argv[3]);
  for (int i = 0; i < count; ++i) {
    char group[256];
    snprintf(group, sizeof group, "%s/p%05d", argv[2], i);
    if (makes)
      make(group, i);
    else if (rmdir(group) != 0)
      fail(group);
  }
  return 0;
}
