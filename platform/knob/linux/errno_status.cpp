// SPDX-License-Identifier: Apache-2.0
// What each errno means when a cgroup's directory or one of its files answers it.
#include "knob/linux/errno_status.h"

#include <cerrno>
#include <system_error>

namespace Knob::Linux {

Status statusOf(int error) noexcept {
  switch (error) {
    case ENOENT:
    case ENODEV:   // the group went away while its directory or file was open
    case ESTALE:   // no group has this id any more
    case ESRCH:    // no such process
    case ENOTDIR:  // a file stands where a group was asked for
    case ELOOP:    // a link does
    case EXDEV:    // a mount does
      return Status::kNotFound;
    case EEXIST:
      return Status::kExists;
    case EBUSY:
    case ENOTEMPTY:
      return Status::kBusy;
    case EINVAL:
    case ERANGE:
    case ENAMETOOLONG:
      return Status::kBadParameter;
    case EACCES:
    case EPERM:
    case EROFS:
      return Status::kPermissionDenied;
    case ENOMEM:
    case ENOSPC:
      return Status::kOutOfMemory;
    case ENOSYS:
    case EOPNOTSUPP:
    case EAGAIN:  // mkdir: the administrator's limit on depth or number of groups is reached
      return Status::kNotSupported;
    default:
      return Status::kFailure;
  }
}

void fail(Status status, int error, const std::string &what) {
  throw KernelError(status, what + ": " + std::generic_category().message(error));
}

void fail(int error, const std::string &what) {
  fail(statusOf(error), error, what);
}

void noSuchGroup() {
  throw KernelError(Status::kNotFound, "no such group");
}

}  // namespace Knob::Linux
