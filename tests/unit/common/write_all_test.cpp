// SPDX-License-Identifier: Apache-2.0
#include "common/write_all.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <string>
#include <thread>

#include "common/unique_fd.h"

namespace Platform {
namespace {

TEST(WriteAll, WritesInPartsWhereOneCallIsNotEnough) {
  std::array<int, 2> ends{};
  ASSERT_EQ(::pipe2(ends.data(), O_CLOEXEC), 0);
  const UniqueFd reader(ends[0]);
  UniqueFd writer(ends[1]);
  const std::string sent(size_t{1} << 20, 'x');  // more than a pipe holds
  std::string received;
  std::thread reading([&] {
    std::array<char, 4096> block{};
    for (ssize_t count = 1; count > 0;) {
      count = ::read(reader.get(), block.data(), block.size());
      if (count > 0) received.append(block.data(), static_cast<size_t>(count));
    }
  });
  EXPECT_EQ(writeAll(writer.get(), sent), 0);
  writer = UniqueFd();
  reading.join();
  EXPECT_EQ(received, sent);
}

TEST(WriteAll, ReturnsTheErrnoOfTheCallThatFails) {
  const UniqueFd full(::open("/dev/full", O_WRONLY | O_CLOEXEC));
  EXPECT_EQ(writeAll(full.get(), "x"), ENOSPC);
  EXPECT_EQ(writeAll(-1, "x"), EBADF);
}

TEST(WriteAll, NothingToWriteIsNoCall) {
  EXPECT_EQ(writeAll(-1, ""), 0);
}

}  // namespace
}  // namespace Platform
