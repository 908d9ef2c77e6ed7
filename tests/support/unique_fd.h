// SPDX-License-Identifier: Apache-2.0
// Owns one file descriptor of a test.
#pragma once

#include <unistd.h>

namespace Test {

class UniqueFd {
 public:
  explicit UniqueFd(int fd) : fd_(fd) {}
  UniqueFd(UniqueFd &&other) noexcept : fd_(other.fd_) { other.fd_ = -1; }
  UniqueFd(const UniqueFd &) = delete;
  UniqueFd &operator=(const UniqueFd &) = delete;
  UniqueFd &operator=(UniqueFd &&) = delete;
  ~UniqueFd() {
    if (fd_ >= 0) close(fd_);
  }

  int get() const { return fd_; }

 private:
  int fd_;
};

}  // namespace Test
