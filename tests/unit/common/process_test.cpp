// SPDX-License-Identifier: Apache-2.0
#include "common/process.h"

#include <gtest/gtest.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <string>

namespace Platform {
namespace {

// A child that waits; without a parent that collects it, a zombie after end().
class Child {
 public:
  explicit Child(const char *name) : pid_(::fork()) {
    if (pid_ != 0) return;
    (void)::prctl(PR_SET_NAME, name);
    for (;;) ::pause();
  }
  Child(const Child &) = delete;
  Child &operator=(const Child &) = delete;
  ~Child() {
    end();
    (void)::waitpid(pid_, nullptr, 0);
  }
  // Kills it and leaves the zombie.
  void end() const {
    (void)::kill(pid_, SIGKILL);
    siginfo_t info;
    (void)::waitid(P_PID, static_cast<id_t>(pid_), &info, WEXITED | WNOWAIT);
  }
  pid_t pid() const { return pid_; }

 private:
  const pid_t pid_;
};

TEST(Process, ALivingProcessHasAStartAndMemory) {
  const auto start = processStart(::getpid());
  ASSERT_TRUE(start);
  EXPECT_GT(*start, 0);
  EXPECT_EQ(processStart(::getpid()), start);
  EXPECT_GT(residentBytes(::getpid()), 100000U);
}

TEST(Process, AZombieIsNotALivingProcess) {
  const Child child("zombie");
  ASSERT_TRUE(processStart(child.pid()));
  child.end();
  EXPECT_EQ(processStart(child.pid()), std::nullopt);
}

TEST(Process, ANameWithBlanksAndParenthesesHidesNothing) {
  const Child child(") Z 1 (");
  while (processName(child.pid()) != ") Z 1 (") ::usleep(1000);
  EXPECT_TRUE(processStart(child.pid()));
}

TEST(Process, AProcessThatDoesNotExistHasNothing) {
  for (const int64_t pid : {int64_t{-1}, int64_t{0}, int64_t{4194305}, INT64_MAX}) {
    EXPECT_EQ(processStart(pid), std::nullopt) << pid;
    EXPECT_EQ(residentBytes(pid), 0U) << pid;
    EXPECT_EQ(processName(pid), "") << pid;
  }
}

}  // namespace
}  // namespace Platform
