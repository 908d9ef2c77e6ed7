// SPDX-License-Identifier: Apache-2.0
// Files and attributes of a directory, and the status of every errno.
#include "knob/linux/cgroup_files.h"

#include <fcntl.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>

#include "common/unique_fd.h"
#include "temp_folder.h"

namespace Knob::Linux {
namespace {

struct Row {
  int error;
  Status status;
};

class ErrnoStatus : public testing::TestWithParam<Row> {};

TEST_P(ErrnoStatus, HasItsOwnStatus) {
  EXPECT_EQ(statusOf(GetParam().error), GetParam().status);
}

INSTANTIATE_TEST_SUITE_P(
    Of, ErrnoStatus,
    testing::Values(Row{ENOENT, Status::kNotFound}, Row{ENODEV, Status::kNotFound},
                    Row{ESTALE, Status::kNotFound}, Row{ESRCH, Status::kNotFound},
                    Row{ENOTDIR, Status::kNotFound}, Row{ELOOP, Status::kNotFound},
                    Row{EXDEV, Status::kNotFound}, Row{EEXIST, Status::kExists},
                    Row{EBUSY, Status::kBusy}, Row{ENOTEMPTY, Status::kBusy},
                    Row{EINVAL, Status::kBadParameter}, Row{ERANGE, Status::kBadParameter},
                    Row{ENAMETOOLONG, Status::kBadParameter},
                    Row{EACCES, Status::kPermissionDenied}, Row{EPERM, Status::kPermissionDenied},
                    Row{EROFS, Status::kPermissionDenied}, Row{ENOMEM, Status::kOutOfMemory},
                    Row{ENOSPC, Status::kOutOfMemory}, Row{ENOSYS, Status::kNotSupported},
                    Row{EOPNOTSUPP, Status::kNotSupported}, Row{EAGAIN, Status::kNotSupported}));

TEST(ErrnoStatus, AnUnexpectedOneIsAFailureAndNeverASuccess) {
  for (int error : {0, EIO, EMFILE, ENFILE, EINTR, EBADF, 4095, -1}) {
    EXPECT_EQ(statusOf(error), Status::kFailure) << error;
  }
}

TEST(Failure, NamesWhatWasTriedAndTheSystemsText) {
  try {
    fail(EBUSY, "cannot remove web");
    FAIL() << "no error";
  } catch (const KernelError &error) {
    EXPECT_EQ(error.status, Status::kBusy);
    EXPECT_STREQ(error.what(), "cannot remove web: Device or resource busy");
  }
}

TEST(Failure, CanHaveAnotherStatusThanTheErrno) {
  try {
    fail(Status::kKernelNotUsable, EOPNOTSUPP, "no attributes");
    FAIL() << "no error";
  } catch (const KernelError &error) {
    EXPECT_EQ(error.status, Status::kKernelNotUsable);
    EXPECT_STREQ(error.what(), "no attributes: Operation not supported");
  }
}

class ControlFile : public testing::Test {
 protected:
  ControlFile() : directory_(::open(folder_.path().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)) {}

  ::Test::TempFolder folder_;
  Platform::UniqueFd directory_;
};

TEST_F(ControlFile, IsReadWithoutItsLineEnd) {
  ::Test::writeFile(folder_.path() / "memory.max", "max\n");
  EXPECT_EQ(readControl(directory_.get(), "memory.max"), "max");
}

TEST_F(ControlFile, IsReadWholeHoweverLongItIs) {
  const std::string pids(100000, '7');
  ::Test::writeFile(folder_.path() / "cgroup.procs", pids);
  EXPECT_EQ(readControl(directory_.get(), "cgroup.procs"), pids);
}

TEST_F(ControlFile, OneThatIsMissingIsAnErrorOrNothing) {
  EXPECT_FALSE(readControlIfAny(directory_.get(), "memory.max"));
  EXPECT_THROW(readControl(directory_.get(), "memory.max"), KernelError);
}

TEST_F(ControlFile, IsNeverCreatedByAWrite) {
  EXPECT_EQ(writeControl(directory_.get(), "memory.max", "1"), ENOENT);
  EXPECT_FALSE(std::filesystem::exists(folder_.path() / "memory.max"));
}

TEST_F(ControlFile, IsNeverTruncatedByAWrite) {
  ::Test::writeFile(folder_.path() / "memory.max", "12345");
  EXPECT_EQ(writeControl(directory_.get(), "memory.max", "99"), 0);
  EXPECT_EQ(readControl(directory_.get(), "memory.max"), "99345");
}

TEST_F(ControlFile, ALinkIsNotFollowed) {
  std::filesystem::create_symlink("/dev/null", folder_.path() / "memory.max");
  EXPECT_EQ(writeControl(directory_.get(), "memory.max", "1"), ELOOP);
}

TEST(Members, AreTheNumbersOfTheLines) {
  EXPECT_EQ(parseMembers("1\n23\n456\n"), (std::vector<int64_t>{1, 23, 456}));
  EXPECT_TRUE(parseMembers("").empty());
}

TEST(Members, AProcessOfAnotherPidNamespaceIsLeftOut) {
  EXPECT_EQ(parseMembers("0\n23\n0"), (std::vector<int64_t>{23}));
}

}  // namespace
}  // namespace Knob::Linux
