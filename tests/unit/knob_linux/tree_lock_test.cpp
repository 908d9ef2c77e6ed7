// SPDX-License-Identifier: Apache-2.0
// The lock on the tree, on a plain folder with a lock file. That other users cannot open the file
// is tested where there are cgroups.
#include "knob/linux/tree_lock.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <optional>
#include <string>
#include <thread>

#include "knob/kernel.h"
#include "temp_folder.h"

namespace Knob::Linux {
namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;
using Kind = TreeLock::Kind;

class Lock : public testing::Test {
 protected:
  Lock() : host_(::open(folder_.path().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)) {
    ::Test::writeFile(folder_.path() / "cgroup.kill", "");
  }

  // What taking the lock throws; empty: it was taken.
  std::string refusal(Kind kind, milliseconds deadline = milliseconds(50)) {
    try {
      const TreeLock lock(host_.get(), kind, deadline);
      return {};
    } catch (const KernelError &error) {
      EXPECT_EQ(error.status, Status::kFailure);
      return error.what();
    }
  }

  ::Test::TempFolder folder_;
  Platform::UniqueFd host_;
};

TEST_F(Lock, AnExclusiveOneExcludesAllOthers) {
  const TreeLock lock(host_.get(), Kind::kExclusive);
  EXPECT_NE(refusal(Kind::kExclusive), "");
  EXPECT_NE(refusal(Kind::kShared), "");
}

TEST_F(Lock, ASharedOneExcludesOnlyExclusiveOnes) {
  const TreeLock lock(host_.get(), Kind::kShared);
  EXPECT_NE(refusal(Kind::kExclusive), "");
  EXPECT_EQ(refusal(Kind::kShared), "");
}

TEST_F(Lock, IsReleasedAtTheEndOfItsScope) {
  { const TreeLock lock(host_.get(), Kind::kExclusive); }
  EXPECT_EQ(refusal(Kind::kExclusive), "");
}

TEST_F(Lock, IsTakenAsSoonAsTheHolderReleasesIt) {
  std::optional<TreeLock> lock;
  lock.emplace(host_.get(), Kind::kExclusive);
  std::thread holder([&] {
    std::this_thread::sleep_for(milliseconds(100));
    lock.reset();
  });
  EXPECT_EQ(refusal(Kind::kExclusive, milliseconds(10000)), "");
  holder.join();
}

TEST_F(Lock, IsRefusedAtTheDeadlineAndNamesTheHolder) {
  const TreeLock lock(host_.get(), Kind::kExclusive);
  const auto begin = steady_clock::now();
  const std::string text = refusal(Kind::kExclusive, milliseconds(1000));
  const auto waited = steady_clock::now() - begin;
  EXPECT_GE(waited, milliseconds(1000));
  EXPECT_LT(waited, milliseconds(5000));
  EXPECT_EQ(text, "the groups have been locked by process " + std::to_string(::getpid()) +
                      " (knob_linux_test) for 1 s");
}

TEST_F(Lock, WithoutALockFileTheDirectoryIsLocked) {
  std::filesystem::remove(folder_.path() / "cgroup.kill");
  const TreeLock lock(host_.get(), Kind::kExclusive);
  EXPECT_NE(refusal(Kind::kExclusive), "");
}

}  // namespace
}  // namespace Knob::Linux
