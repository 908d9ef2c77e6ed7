// SPDX-License-Identifier: Apache-2.0
// Files are opened for writing without creating or truncating: a name that is no control file must
// stay an error.
#include "knob/linux/cgroup_files.h"

#include <fcntl.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <cerrno>

#include "knob/linux/errno_status.h"

namespace Knob::Linux {
namespace {

using Platform::UniqueFd;

constexpr size_t kReadStep = 4096;
// More than any attribute of ours; a longer one is damaged, and its length alone says so.
constexpr size_t kMostAttributeBytes = 256;

// Reads to the end. 0, or the errno.
int readWhole(int file, std::string &text) {
  for (;;) {
    const size_t before = text.size();
    text.resize(before + kReadStep);
    const ssize_t count = ::read(file, text.data() + before, kReadStep);
    text.resize(before + static_cast<size_t>(count > 0 ? count : 0));
    if (count == 0) return 0;
    if (count < 0 && errno != EINTR) return errno;
  }
}

int readInto(int directory, const char *name, std::string &text) {
  const UniqueFd file(::openat(directory, name, O_RDONLY | O_CLOEXEC | O_NOFOLLOW));
  if (!file) return errno;
  const int error = readWhole(file.get(), text);
  if (!text.empty() && text.back() == '\n') text.pop_back();
  return error;
}

}  // namespace

int openForWriting(int directory, const char *name, UniqueFd &file) {
  file = UniqueFd(::openat(directory, name, O_WRONLY | O_CLOEXEC | O_NOFOLLOW));
  return file ? 0 : errno;
}

int writeWhole(int file, std::string_view text) {
  ssize_t count = 0;
  do {
    count = ::pwrite(file, text.data(), text.size(), 0);
  } while (count < 0 && errno == EINTR);
  if (count < 0) return errno;
  return static_cast<size_t>(count) == text.size() ? 0 : EIO;
}

int writeControl(int directory, const char *name, std::string_view text) {
  UniqueFd file;
  const int error = openForWriting(directory, name, file);
  return error != 0 ? error : writeWhole(file.get(), text);
}

std::string readControl(int directory, const char *name) {
  std::string text;
  if (const int error = readInto(directory, name, text); error != 0) {
    fail(error, std::string("cannot read ") + name);
  }
  return text;
}

std::optional<std::string> readControlIfAny(int directory, const char *name) {
  std::string text;
  const int error = readInto(directory, name, text);
  if (error == ENOENT || error == ENODEV) return std::nullopt;
  if (error != 0) fail(error, std::string("cannot read ") + name);
  return text;
}

std::optional<std::string> readAttribute(int directory, const char *name) {
  std::array<char, kMostAttributeBytes> value;
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
         "groups take no attributes of this kind on this kernel; Linux 5.7 or newer is needed");
  }
  fail(error, std::string("cannot write the attribute ") + name);
}

void removeAttribute(int directory, const char *name) {
  if (::fremovexattr(directory, name) == 0 || errno == ENODATA) return;
  fail(errno, std::string("cannot remove the attribute ") + name);
}

}  // namespace Knob::Linux
