// SPDX-License-Identifier: Apache-2.0
#include "common/unique_fd.h"

#include <fcntl.h>
#include <gtest/gtest.h>

#include <cerrno>

namespace Platform {
namespace {

bool isOpen(int fd) {
  return ::fcntl(fd, F_GETFD) != -1;
}

int openNull() {
  return ::open("/dev/null", O_RDONLY | O_CLOEXEC);
}

TEST(UniqueFd, ClosesOnLeaving) {
  const int fd = openNull();
  {
    const UniqueFd owned(fd);
    EXPECT_TRUE(owned);
    EXPECT_EQ(owned.get(), fd);
    EXPECT_TRUE(isOpen(fd));
  }
  EXPECT_FALSE(isOpen(fd));
}

TEST(UniqueFd, AnEmptyOneOwnsNothing) {
  const UniqueFd empty;
  EXPECT_FALSE(empty);
  EXPECT_FALSE(UniqueFd(-1));
}

TEST(UniqueFd, MovesItsDescriptorAndClosesTheOneThatItHeld) {
  const int first = openNull();
  const int second = openNull();
  UniqueFd from(first);
  UniqueFd to(second);
  to = std::move(from);
  EXPECT_FALSE(isOpen(second));
  EXPECT_EQ(to.get(), first);
  const UniqueFd last(std::move(to));
  EXPECT_EQ(last.get(), first);
  EXPECT_TRUE(isOpen(first));
}

TEST(UniqueFd, AMoveToItselfKeepsTheDescriptor) {
  UniqueFd owned(openNull());
  UniqueFd &same = owned;
  owned = std::move(same);
  EXPECT_TRUE(isOpen(owned.get()));
}

}  // namespace
}  // namespace Platform
