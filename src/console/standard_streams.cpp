// SPDX-License-Identifier: Apache-2.0
#include "console/standard_streams.h"

#include <fcntl.h>
#include <unistd.h>

namespace Console {

void occupyClosedStreams() noexcept {
  for (int stream = STDIN_FILENO; stream <= STDERR_FILENO; ++stream) {
    if (fcntl(stream, F_GETFD) != -1) continue;
    // The wrong direction, so that lost output is noticed. The lowest free number is STREAM.
    const int direction = stream == STDIN_FILENO ? O_WRONLY : O_RDONLY;
    if (open("/dev/null", direction) != stream) _exit(1);
  }
}

}  // namespace Console
