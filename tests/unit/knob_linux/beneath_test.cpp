// SPDX-License-Identifier: Apache-2.0
// Opening directories below one directory, in both ways: with one system call, and component by
// component. A plain folder is enough for all that needs no cgroup.
#include "knob/linux/beneath.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>
#include <filesystem>

#include "temp_folder.h"

namespace Knob::Linux {
namespace {

using Platform::UniqueFd;
using Open = int (*)(int, std::string_view, UniqueFd &);

class Beneath : public testing::TestWithParam<Open> {
 protected:
  Beneath() {
    std::filesystem::create_directories(folder_.path() / "a/b/c");
    ::Test::writeFile(folder_.path() / "a/file", "");
    std::filesystem::create_directory_symlink("b", folder_.path() / "a/link");
    std::filesystem::create_directory_symlink("/", folder_.path() / "a/root");
    start_ = UniqueFd(::open(folder_.path().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  }

  int open(std::string_view path) { return GetParam()(start_.get(), path, opened_); }
  ino_t inodeOf(const std::string &path) {
    struct stat status {};
    EXPECT_EQ(::stat((folder_.path() / path).c_str(), &status), 0);
    return status.st_ino;
  }

  ::Test::TempFolder folder_;
  UniqueFd start_, opened_;
};

INSTANTIATE_TEST_SUITE_P(InBothWays, Beneath, testing::Values(openBeneath, openByComponents));

TEST_P(Beneath, ADirectoryIsOpenedAtAnyDepth) {
  for (const char *path : {"a", "a/b", "a/b/c"}) {
    ASSERT_EQ(open(path), 0) << path;
    struct stat status {};
    ASSERT_EQ(::fstat(opened_.get(), &status), 0);
    EXPECT_EQ(status.st_ino, inodeOf(path)) << path;
    EXPECT_NE(::fcntl(opened_.get(), F_GETFD) & FD_CLOEXEC, 0);
  }
}

TEST_P(Beneath, AMissingDirectoryIsNotFound) {
  EXPECT_EQ(open("x"), ENOENT);
  EXPECT_EQ(open("a/x/c"), ENOENT);
  EXPECT_EQ(open(""), ENOENT);
}

TEST_P(Beneath, AFileIsNotADirectory) {
  EXPECT_EQ(open("a/file"), ENOTDIR);
  EXPECT_EQ(open("a/file/x"), ENOTDIR);
}

TEST_P(Beneath, ALinkIsNotFollowed) {
  for (const char *path : {"a/link", "a/link/c", "a/root", "a/root/proc"}) {
    const int error = open(path);
    EXPECT_TRUE(error == ELOOP || error == ENOTDIR) << path << ": " << error;
  }
}

TEST_P(Beneath, APathCannotLeadUpwards) {
  EXPECT_EQ(open(".."), EXDEV);
  EXPECT_EQ(open("a/../.."), EXDEV);
  EXPECT_EQ(open("a/b/../../../etc"), EXDEV);
}

TEST_P(Beneath, AnotherFileSystemIsNotEntered) {
  const UniqueFd root(::open("/", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  EXPECT_EQ(GetParam()(root.get(), "proc", opened_), EXDEV);
}

TEST(Identity, IsThatOfTheDirectoryItself) {
  const ::Test::TempFolder folder;
  std::filesystem::create_directories(folder.path() / "a");
  const UniqueFd start(::open(folder.path().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  UniqueFd inner;
  ASSERT_EQ(openBeneath(start.get(), "a", inner), 0);
  Identity byPath, byItself, ofStart;
  ASSERT_EQ(identify(start.get(), "a", byPath), 0);
  ASSERT_EQ(identify(inner.get(), "", byItself), 0);
  ASSERT_EQ(identify(start.get(), "", ofStart), 0);
  EXPECT_EQ(byPath.id, byItself.id);
  EXPECT_NE(byPath.id, ofStart.id);
  EXPECT_EQ(byPath.mount, ofStart.mount);
  EXPECT_EQ(identify(start.get(), "x", byPath), ENOENT);
}

}  // namespace
}  // namespace Knob::Linux
