// SPDX-License-Identifier: Apache-2.0
// What Linux answers, and what libknob's callers get.
#include "knob/linux/errno_status.h"

#include <gtest/gtest.h>

#include <cerrno>

namespace Knob::Linux {
namespace {

struct Row {
  int error;
  Status status;
};

class ErrnoStatus : public testing::TestWithParam<Row> {};

TEST_P(ErrnoStatus, IsTheOneThatCallersTellApart) {
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

TEST(ErrnoStatus, WhatNobodyForesawIsAFailureAndNeverASuccess) {
  for (int error : {0, EIO, EMFILE, ENFILE, EINTR, EBADF, 4095, -1}) {
    EXPECT_EQ(statusOf(error), Status::kFailure) << error;
  }
}

TEST(Failure, SaysWhatWasTriedAndWhatTheSystemAnswered) {
  try {
    fail(EBUSY, "cannot remove web");
    FAIL() << "no error";
  } catch (const KernelError &error) {
    EXPECT_EQ(error.status, Status::kBusy);
    EXPECT_STREQ(error.what(), "cannot remove web: Device or resource busy");
  }
}

TEST(Failure, CanCarryAStatusOfItsOwn) {
  try {
    fail(Status::kKernelNotUsable, EOPNOTSUPP, "no attributes");
    FAIL() << "no error";
  } catch (const KernelError &error) {
    EXPECT_EQ(error.status, Status::kKernelNotUsable);
    EXPECT_STREQ(error.what(), "no attributes: Operation not supported");
  }
}

}  // namespace
}  // namespace Knob::Linux
