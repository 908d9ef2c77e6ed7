// SPDX-License-Identifier: Apache-2.0
// Where a kernel lacks openat2, or a filter forbids it, a path is opened component by component.
#include "knob/linux/beneath.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <climits>
#include <cstddef>
#include <cstring>

namespace Knob::Linux {
namespace {

using Platform::UniqueFd;

constexpr int kDirectoryFlags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
// The type of a cgroup's file handle, which consists of its 64-bit id.
constexpr int kKernfsHandleType = 0xfe;

// A file handle with room for a 64-bit id. file_handle ends in a flexible array, which no C++ class
// may contain, so it is a view of the bytes.
class KernfsHandle {
 public:
  explicit KernfsHandle(uint64_t id = 0) {
    get()->handle_bytes = sizeof id;
    get()->handle_type = kKernfsHandleType;
    std::memcpy(bytes_.data() + sizeof(file_handle), &id, sizeof id);
  }

  file_handle *get() { return reinterpret_cast<file_handle *>(bytes_.data()); }

  uint64_t id() const {
    uint64_t id = 0;
    std::memcpy(&id, bytes_.data() + sizeof(file_handle), sizeof id);
    return id;
  }

 private:
  alignas(file_handle) std::array<std::byte, sizeof(file_handle) + sizeof(uint64_t)> bytes_{};
};

int callOpenat2(int directory, const std::string &path, UniqueFd &opened) {
  open_how how{};
  how.flags = kDirectoryFlags;
  how.resolve = RESOLVE_BENEATH | RESOLVE_NO_SYMLINKS | RESOLVE_NO_MAGICLINKS | RESOLVE_NO_XDEV;
  for (;;) {
    opened = UniqueFd(
        static_cast<int>(::syscall(SYS_openat2, directory, path.c_str(), &how, sizeof how)));
    if (opened) return 0;
    // A rename or mount on this machine interfered.
    if (errno != EAGAIN && errno != EINTR) return errno;
  }
}

// No mount id has this bit.
constexpr uint64_t kDeviceMark = uint64_t{1} << 63;

// Without name_to_handle_at: the inode number is the id, and the device identifies the mount.
int identifyByInode(int directory, const char *path, Identity &identity) {
  struct stat status {};
  if (::fstatat(directory, path, &status, AT_SYMLINK_NOFOLLOW | AT_EMPTY_PATH) != 0) return errno;
  identity = {static_cast<GroupId>(status.st_ino), status.st_dev | kDeviceMark};
  return 0;
}

bool isCallRefused(int error) {
  return error == ENOSYS || error == EPERM;
}

}  // namespace

int openBeneath(int directory, std::string_view path, UniqueFd &opened) {
  if (path.size() >= PATH_MAX) return openByComponents(directory, path, opened);
  const int error = callOpenat2(directory, std::string(path), opened);
  return isCallRefused(error) ? openByComponents(directory, path, opened) : error;
}

int openByComponents(int directory, std::string_view path, UniqueFd &opened) {
  Identity start;
  if (const int error = identify(directory, "", start); error != 0) return error;
  int at = directory;
  for (;;) {
    const size_t end = path.find('/');
    const std::string name(path.substr(0, end));
    if (name == "..") return EXDEV;
    UniqueFd next(::openat(at, name.c_str(), kDirectoryFlags));
    if (!next) return errno;
    Identity there;
    if (const int error = identify(next.get(), "", there); error != 0) return error;
    if (there.mount != start.mount) return EXDEV;
    opened = std::move(next);
    at = opened.get();
    if (end == std::string_view::npos) return 0;
    path.remove_prefix(end + 1);
  }
}

int identify(int directory, const char *path, Identity &identity) {
  KernfsHandle handle;
  int mount = 0;
  if (::name_to_handle_at(directory, path, handle.get(), &mount, AT_EMPTY_PATH) == 0) {
    if (handle.get()->handle_type == kKernfsHandleType) {
      identity = {static_cast<GroupId>(handle.id()), static_cast<uint64_t>(mount)};
      return 0;
    }
    return identifyByInode(directory, path, identity);
  }
  // EOVERFLOW: a larger handle, of another file system.
  const bool hasNoHandle = errno == EOPNOTSUPP || errno == EOVERFLOW || isCallRefused(errno);
  return hasNoHandle ? identifyByInode(directory, path, identity) : errno;
}

int openById(int anyDirectory, GroupId id, UniqueFd &opened) {
  KernfsHandle handle(static_cast<uint64_t>(id));
  opened = UniqueFd(::open_by_handle_at(anyDirectory, handle.get(), kDirectoryFlags));
  return opened ? 0 : errno;
}

}  // namespace Knob::Linux
