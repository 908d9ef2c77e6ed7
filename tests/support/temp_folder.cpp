// SPDX-License-Identifier: Apache-2.0
#include "temp_folder.h"

#include <sys/xattr.h>

#include <cerrno>
#include <cstdlib>
#include <fstream>
#include <sstream>
#include <system_error>

namespace Test {

namespace fs = std::filesystem;

TempFolder::TempFolder() {
  const char *parent = getenv("TMPDIR");
  std::string name = (fs::path(parent == nullptr ? "/tmp" : parent) / "poolctl-XXXXXX").string();
  if (mkdtemp(name.data()) == nullptr)
    throw std::system_error(errno, std::generic_category(), name);
  path_ = name;
}

TempFolder::~TempFolder() {
  std::error_code ignored;  // left-over files do no harm
  fs::remove_all(path_, ignored);
}

void writeFile(const fs::path &path, std::string_view content) {
  std::ofstream file(path, std::ios::binary);
  file << content << std::flush;
  if (!file) throw std::system_error(errno, std::generic_category(), path);
}

std::string readFile(const fs::path &path) {
  std::ostringstream content;
  content << std::ifstream(path, std::ios::binary).rdbuf();
  return content.str();
}

void setInstalledMark(const fs::path &path, std::string_view value) {
  const auto set = [&](const char *name) {
    return setxattr(path.c_str(), name, value.data(), value.size(), 0) == 0;
  };
  if (set("orrery.installed")) return;
  if (errno != ENOTSUP || !set("user.orrery.installed"))
    throw std::system_error(errno, std::generic_category(), path);
}

}  // namespace Test
