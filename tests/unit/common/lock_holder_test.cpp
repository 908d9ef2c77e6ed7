// SPDX-License-Identifier: Apache-2.0
#include "common/lock_holder.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>

#include "common/unique_fd.h"
#include "temp_folder.h"

namespace Platform {
namespace {

// A process that holds a lock on a file until the test ends.
class Holder {
 public:
  Holder(const std::string &file, short type) {
    std::array<int, 2> ready{};
    EXPECT_EQ(::pipe2(ready.data(), O_CLOEXEC), 0);
    const UniqueFd reader(ready[0]), writer(ready[1]);
    pid_ = ::fork();
    if (pid_ == 0) {
      struct flock lock {};
      lock.l_type = type;
      lock.l_whence = SEEK_SET;
      lock.l_start = 120;
      lock.l_len = 1;
      const int fd = ::open(file.c_str(), O_RDWR | O_CLOEXEC);
      if (::fcntl(fd, F_SETLK, &lock) != 0) ::_exit(1);
      (void)!::write(writer.get(), "x", 1);
      for (;;) ::pause();
    }
    char byte = 0;
    EXPECT_EQ(::read(reader.get(), &byte, 1), 1);
  }
  Holder(const Holder &) = delete;
  Holder &operator=(const Holder &) = delete;
  ~Holder() {
    (void)::kill(pid_, SIGKILL);
    (void)::waitpid(pid_, nullptr, 0);
  }
  pid_t pid() const { return pid_; }

 private:
  pid_t pid_ = -1;
};

class LockHolder : public testing::Test {
 protected:
  LockHolder() { ::Test::writeFile(file_, std::string(200, 'x')); }

  const ::Test::TempFolder folder_;
  const std::string file_ = folder_.path() / "file";
};

TEST_F(LockHolder, IsTheProcessWithALockForWriting) {
  const Holder holder(file_, F_WRLCK);
  EXPECT_EQ(writeLockHolder(file_), holder.pid());
  EXPECT_EQ(lockHolderText({file_ + "-none", file_}),
            "process " + std::to_string(holder.pid()) + " (common_test)");
}

TEST_F(LockHolder, AReaderHoldsNothingBack) {
  const Holder holder(file_, F_RDLCK);
  EXPECT_EQ(writeLockHolder(file_), std::nullopt);
}

TEST_F(LockHolder, WithoutALockItIsAnotherProcess) {
  EXPECT_EQ(writeLockHolder(file_), std::nullopt);
  EXPECT_EQ(writeLockHolder(file_ + "-none"), std::nullopt);
  EXPECT_EQ(lockHolderText({file_}), "another process");
}

}  // namespace
}  // namespace Platform
