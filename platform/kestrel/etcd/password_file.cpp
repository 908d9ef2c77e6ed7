// SPDX-License-Identifier: Apache-2.0
// What is checked is what is read: one descriptor for both.
#include "kestrel/etcd/password_file.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <array>
#include <cerrno>
#include <system_error>

#include "common/unique_fd.h"
#include "kestrel/errors.h"

namespace Kestrel::Etcd {

namespace {

constexpr size_t kMaxBytes = 4096;

KestrelConfigStore::ConfigStoreException refusal(const std::string &path, const std::string &why) {
  return storeError(path, "the password file", why);
}

KestrelConfigStore::ConfigStoreException systemRefusal(const std::string &path, int error) {
  return refusal(path, std::generic_category().message(error));
}

std::string readAll(int fd, const std::string &path) {
  std::array<char, kMaxBytes + 1> buffer{};
  size_t size = 0;
  while (size < buffer.size()) {
    const ssize_t count = ::read(fd, buffer.data() + size, buffer.size() - size);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) throw systemRefusal(path, errno);
    if (count == 0) break;
    size += static_cast<size_t>(count);
  }
  if (size > kMaxBytes) throw refusal(path, "is larger than 4096 bytes");
  return std::string(buffer.data(), size);
}

}  // namespace

std::string readPassword(const std::string &path) {
  // A pipe without a writer must not hold up the open.
  const Platform::UniqueFd fd(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  if (!fd) throw systemRefusal(path, errno);
  struct stat info {};
  if (::fstat(fd.get(), &info) != 0) throw systemRefusal(path, errno);
  if (!S_ISREG(info.st_mode)) throw refusal(path, "is not a regular file");
  if ((info.st_mode & (S_IRWXG | S_IRWXO)) != 0) {
    throw refusal(path, "others than its owner have access (chmod 600)");
  }
  std::string password = readAll(fd.get(), path);
  if (!password.empty() && password.back() == '\n') password.pop_back();
  if (password.empty()) throw refusal(path, "is empty");
  if (password.find('\n') != password.npos) throw refusal(path, "has more than one line");
  return password;
}

}  // namespace Kestrel::Etcd
