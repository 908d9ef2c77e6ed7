// SPDX-License-Identifier: Apache-2.0
// Every name is opened relative to a directory's descriptor, so that a group that was deleted stays
// deleted for its holder, even when another group of its name was made.
#include "knob/linux/cgroup_files.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <memory>
#include <system_error>

#include "common/unique_fd.h"

namespace Knob::Linux {
namespace {

using Platform::UniqueFd;

constexpr size_t kReadStep = 4096;
// More than any of our attributes. A longer one is damaged.
constexpr size_t kMaxAttributeBytes = 256;

struct DirectoryCloser {
  void operator()(DIR *directory) const { (void)::closedir(directory); }
};

// Linux returns the whole of a control file in one read where the buffer is large enough. Only
// cgroup.procs comes in parts.
enum class Parts { kOne, kMany };

// Reads to the end. Returns 0 or the errno.
int readWhole(int file, Parts parts, std::string &text) {
  for (;;) {
    const size_t before = text.size();
    text.resize(before + kReadStep);
    const ssize_t count = ::read(file, text.data() + before, kReadStep);
    const int error = errno;
    text.resize(before + static_cast<size_t>(count > 0 ? count : 0));
    if (count == 0) return 0;
    if (count < 0 && error != EINTR) return error;
    if (count > 0 && static_cast<size_t>(count) < kReadStep && parts == Parts::kOne) return 0;
  }
}

int readInto(int directory, const char *name, Parts parts, std::string &text) {
  const UniqueFd file(::openat(directory, name, O_RDONLY | O_CLOEXEC | O_NOFOLLOW));
  if (!file) return errno;
  const int error = readWhole(file.get(), parts, text);
  if (!text.empty() && text.back() == '\n') text.pop_back();
  return error;
}

// One call. A short write is EIO.
int writeWhole(int file, std::string_view text) {
  ssize_t count = 0;
  do {
    count = ::pwrite(file, text.data(), text.size(), 0);
  } while (count < 0 && errno == EINTR);
  if (count < 0) return errno;
  return static_cast<size_t>(count) == text.size() ? 0 : EIO;
}

}  // namespace

Status statusOf(int error) noexcept {
  switch (error) {
    case ENOENT:
    case ENODEV:   // the group was deleted while its directory or file was open
    case ESTALE:   // no group has this id any more
    case ESRCH:    // no such process
    case ENOTDIR:  // a file, not a group
    case ELOOP:    // a symbolic link, not a group
    case EXDEV:    // a mount point, not a group
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
    case EAGAIN:  // mkdir: cgroup.max.depth or cgroup.max.descendants is reached
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

int writeControl(int directory, const char *name, std::string_view text) {
  const UniqueFd file(::openat(directory, name, O_WRONLY | O_CLOEXEC | O_NOFOLLOW));
  return file ? writeWhole(file.get(), text) : errno;
}

// Throws KernelError.
std::string readParts(int directory, const char *name, Parts parts) {
  std::string text;
  if (const int error = readInto(directory, name, parts, text); error != 0) {
    fail(error, std::string("cannot read ") + name);
  }
  return text;
}

std::string readControl(int directory, const char *name) {
  return readParts(directory, name, Parts::kOne);
}

std::optional<std::string> readControlIfAny(int directory, const char *name) {
  std::string text;
  const int error = readInto(directory, name, Parts::kOne, text);
  if (error == ENOENT || error == ENODEV) return std::nullopt;
  if (error != 0) fail(error, std::string("cannot read ") + name);
  return text;
}

bool hasControl(int directory, const char *name) {
  return ::faccessat(directory, name, F_OK, 0) == 0;
}

std::vector<Child> readChildren(int group) {
  UniqueFd directory(::openat(group, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!directory) fail(errno, "cannot read the group's directory");
  const std::unique_ptr<DIR, DirectoryCloser> stream(::fdopendir(directory.get()));
  if (!stream) fail(errno, "cannot read the group's directory");
  (void)directory.release();  // the stream closes it

  std::vector<Child> children;
  for (errno = 0; const dirent *entry = ::readdir(stream.get()); errno = 0) {
    const std::string_view name = entry->d_name;
    if (entry->d_type != DT_DIR || name == "." || name == "..") continue;
    children.push_back({static_cast<GroupId>(entry->d_ino), std::string(name)});
  }
  if (errno != 0) fail(errno, "cannot read the group's directory");
  return children;
}

std::vector<int64_t> readMembers(int directory) {
  return parseMembers(readParts(directory, kMembersFile, Parts::kMany));
}

std::vector<int64_t> parseMembers(std::string_view text) {
  std::vector<int64_t> pids;
  for (size_t start = 0; start < text.size();) {
    const size_t end = std::min(text.find('\n', start), text.size());
    int64_t pid = 0;
    const auto [stop, error] = std::from_chars(text.data() + start, text.data() + end, pid);
    // A process of another pid namespace is listed as 0, which would name the caller.
    if (error == std::errc() && stop == text.data() + end && pid > 0) pids.push_back(pid);
    start = end + 1;
  }
  return pids;
}

std::optional<std::string> readAttribute(int directory, const char *name) {
  std::array<char, kMaxAttributeBytes> value;
  const ssize_t size = ::fgetxattr(directory, name, value.data(), value.size());
  if (size >= 0) return std::string(value.data(), static_cast<size_t>(size));
  if (errno == ENODATA) return std::nullopt;
  if (errno == ERANGE) return std::string(value.size(), '\0');
  fail(errno, std::string("cannot read the attribute ") + name);
}

void writeAttribute(int directory, const char *name, std::string_view value, Attribute kind) {
  const int flags = kind == Attribute::kNew ? XATTR_CREATE : 0;
  if (::fsetxattr(directory, name, value.data(), value.size(), flags) == 0) return;
  const int error = errno;
  if (error == EOPNOTSUPP) {
    fail(Status::kKernelNotUsable, error,
         "this kernel has no user attributes on cgroups; Linux 5.7 or newer is needed");
  }
  fail(error, std::string("cannot write the attribute ") + name);
}

void removeAttribute(int directory, const char *name) {
  if (::fremovexattr(directory, name) == 0 || errno == ENODATA) return;
  fail(errno, std::string("cannot remove the attribute ") + name);
}

}  // namespace Knob::Linux
