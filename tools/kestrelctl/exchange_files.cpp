// SPDX-License-Identifier: Apache-2.0
// A file is written beside its name and renamed, so that a full disk costs nobody an older export.
#include "kestrelctl/exchange_files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <iostream>
#include <iterator>
#include <system_error>

#include "common/read_file.h"
#include "common/unique_fd.h"
#include "kestrel/exchange.h"
#include "shared/tool.h"

namespace Kestrelctl {

namespace {

using Platform::UniqueFd;

// More than any store of one host; keeps a mistaken path from filling the memory.
constexpr size_t kMaxBytes = size_t{1} << 30;

Tools::Failure systemFailure(const std::string &file, int error) {
  return {Tools::kExitFailure, file + ": " + std::generic_category().message(error)};
}

void writeAll(int fd, const std::string &file, const std::string &text) {
  for (size_t at = 0; at < text.size();) {
    const ssize_t count = write(fd, text.data() + at, text.size() - at);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) throw systemFailure(file, errno);
    at += static_cast<size_t>(count);
  }
}

// file: the name that the user knows.
UniqueFd opened(const std::string &path, int flags, const std::string &file) {
  constexpr mode_t kMode = 0666;  // what the umask leaves of it, as for every file
  UniqueFd fd(open(path.c_str(), flags | O_WRONLY | O_CREAT | O_CLOEXEC, kMode));
  if (!fd) throw systemFailure(file, errno);
  return fd;
}

void replaceFile(const std::string &file, const std::string &text) {
  const std::string scratch = file + ".new-" + std::to_string(getpid());
  const UniqueFd fd = opened(scratch, O_EXCL, file);
  try {
    writeAll(fd.get(), file, text);
    if (fsync(fd.get()) != 0) throw systemFailure(file, errno);
    if (rename(scratch.c_str(), file.c_str()) != 0) throw systemFailure(file, errno);
  } catch (...) {
    (void)unlink(scratch.c_str());
    throw;
  }
}

// A terminal, a pipe, a link: something that is there and must not be put out of its place.
bool isSpecial(const std::string &file) {
  struct stat found {};
  return lstat(file.c_str(), &found) == 0 && !S_ISREG(found.st_mode);
}

std::string standardInput() {
  return {std::istreambuf_iterator<char>(std::cin), std::istreambuf_iterator<char>()};
}

std::string content(const std::string &file) {
  try {
    return Platform::readFile(file, kMaxBytes);
  } catch (const std::system_error &error) {
    throw systemFailure(file, error.code().value());
  }
}

}  // namespace

void writeExchangeFile(const std::string &file, const std::vector<Kestrel::StoredObject> &objects) {
  const std::string text = Kestrel::writeExchange(objects);
  if (file.empty() || file == "-") {
    std::cout << text;
  } else if (isSpecial(file)) {
    writeAll(opened(file, O_TRUNC, file).get(), file, text);
  } else {
    replaceFile(file, text);
  }
}

std::vector<Kestrel::StoredObject> readExchangeFile(const std::string &file) {
  if (file == "-") return Kestrel::readExchange(standardInput(), "standard input");
  return Kestrel::readExchange(content(file), file);
}

}  // namespace Kestrelctl
