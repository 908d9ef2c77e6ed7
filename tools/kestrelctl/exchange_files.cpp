// SPDX-License-Identifier: Apache-2.0
// A regular file is replaced whole, so that a full disk does not destroy an older export.
#include "kestrelctl/exchange_files.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <iostream>
#include <iterator>
#include <system_error>

#include "common/read_file.h"
#include "common/unique_fd.h"
#include "kestrel/exchange_read.h"
#include "kestrel/exchange_write.h"
#include "kestrel/replace_file.h"
#include "shared/tool.h"

namespace Kestrelctl {

namespace {

// Larger than the store of any host. A mistaken path must not fill the memory.
constexpr size_t kMaxBytes = size_t{1} << 30;

Tools::Failure systemFailure(const std::string &file, int error) {
  return {Tools::kExitFailure, file + ": " + std::generic_category().message(error)};
}

constexpr mode_t kMode = 0666;  // limited by the umask, as for every file

// A terminal, a pipe, a link: something that must be written to, not replaced.
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
    return;
  }
  try {
    if (!isSpecial(file)) return Kestrel::replaceFile(file, text, kMode);
    const Platform::UniqueFd fd(open(file.c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC));
    if (!fd) throw systemFailure(file, errno);
    Kestrel::writeAll(fd.get(), text);
  } catch (const std::system_error &error) {
    throw systemFailure(file, error.code().value());
  }
}

std::vector<Kestrel::StoredObject> readExchangeFile(const std::string &file) {
  if (file == "-") return Kestrel::readExchange(standardInput(), "standard input");
  return Kestrel::readExchange(content(file), file);
}

}  // namespace Kestrelctl
