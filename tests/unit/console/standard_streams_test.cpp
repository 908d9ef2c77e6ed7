// SPDX-License-Identifier: Apache-2.0
#include "console/standard_streams.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <functional>

namespace {

// Whether BODY returns true in a process of its own, whose streams it may close.
bool holds(const std::function<bool()> &body) {
  std::fflush(nullptr);
  const pid_t child = fork();
  if (child == 0) _exit(body() ? 0 : 1);
  int status = -1;
  waitpid(child, &status, 0);
  return WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

bool isOpen(int descriptor) {
  return fcntl(descriptor, F_GETFD) != -1;
}

TEST(StandardStreams, ThatAreClosedAreOccupied) {
  for (int closed = 1; closed < 8; ++closed) {
    EXPECT_TRUE(holds([closed] {
      for (int stream = 0; stream < 3; ++stream) {
        if ((closed >> stream) % 2 == 1) close(stream);
      }
      Console::occupyClosedStreams();
      const int next = open("/dev/null", O_RDONLY);
      return isOpen(0) && isOpen(1) && isOpen(2) && next > 2;
    })) << closed;
  }
}

TEST(StandardStreams, ThatWereClosedStillFail) {
  EXPECT_TRUE(holds([] {
    for (int stream = 0; stream < 3; ++stream) close(stream);
    Console::occupyClosedStreams();
    char byte = 0;
    return read(0, &byte, 1) == -1 && errno == EBADF && write(1, "a", 1) == -1 &&
           write(2, "a", 1) == -1;
  }));
}

TEST(StandardStreams, ThatAreOpenAreNotTouched) {
  EXPECT_TRUE(holds([] {
    int ends[2];
    if (pipe(ends) != 0) return false;
    dup2(ends[1], 1);
    Console::occupyClosedStreams();
    char byte = 0;
    return write(1, "a", 1) == 1 && read(ends[0], &byte, 1) == 1 && byte == 'a';
  }));
}

}  // namespace
