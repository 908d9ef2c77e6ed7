// SPDX-License-Identifier: Apache-2.0
// Finds the definition files, insists on their installed mark, and gathers their pools.
#include "loader/definition_files.h"

#include <dirent.h>
#include <sys/xattr.h>

#include <algorithm>
#include <cerrno>
#include <exception>
#include <system_error>

#include "loader/file_error.h"

namespace Loader {
namespace {

struct CloseFolder {
  void operator()(DIR *folder) const { closedir(folder); }
};

[[noreturn]] void throwFolderError() {
  throw std::system_error(errno, std::generic_category(), kDefinitionFolder);
}

// Newer yaml libraries add the path, which the file error names already.
std::string bareMessage(const YAML::Exception &error) {
  if (dynamic_cast<const YAML::BadFile *>(&error) != nullptr) return YAML::ErrorMsg::BAD_FILE;
  return error.msg;
}

}  // namespace

// The listing's own type counts: links, folders and entries of unknown type are no definitions.
std::vector<std::string> listDefinitionFolder() {
  const std::unique_ptr<DIR, CloseFolder> folder(opendir(kDefinitionFolder));
  if (!folder) throwFolderError();
  std::vector<std::string> paths;
  for (;;) {
    errno = 0;
    const dirent *const entry = readdir(folder.get());
    if (entry == nullptr) break;
    if (entry->d_type != DT_REG || entry->d_name[0] == '.') continue;
    paths.push_back(std::string(kDefinitionFolder) + "/" + entry->d_name);
  }
  if (errno != 0) throwFolderError();
  return paths;
}

bool isInstalled(const std::string &path) {
  for (const char *const mark : kInstalledMarks) {
    char value = 0;
    const ssize_t size = getxattr(path.c_str(), mark, &value, sizeof value);
    if (size == 1) return value == 1;
    if (size >= 0 || errno != ENOTSUP) return false;
  }
  return false;
}

PoolList readFile(const std::string &path) {
  try {
    PoolList pools;
    const YAML::Node document = YAML::LoadFile(path);
    for (const auto &item : document) pools.push_back(std::make_shared<ResourcePoolImpl>(item));
    return pools;
  } catch (const YAML::Exception &error) {
    std::throw_with_nested(FileError(path, bareMessage(error), error.mark));
  } catch (const std::exception &error) {
    std::throw_with_nested(FileError(path, error.what(), YAML::Mark::null_mark()));
  }
}

PoolList loadPools(const std::vector<std::string> &files, bool descending) {
  PoolList pools;
  for (const std::string &path : files.empty() ? listDefinitionFolder() : files) {
    if (!isInstalled(path)) throw FileError(path, "is not installed", YAML::Mark::null_mark());
    PoolList read = readFile(path);
    std::move(read.begin(), read.end(), std::back_inserter(pools));
  }
  std::sort(pools.begin(), pools.end(), [descending](const auto &a, const auto &b) {
    return descending ? b->name < a->name : a->name < b->name;
  });
  return pools;
}

std::shared_ptr<ResourcePoolImpl> findPool(const std::string &name, const PoolList &pools) {
  const auto found = std::find_if(pools.begin(), pools.end(),
                                  [&name](const auto &pool) { return pool->name == name; });
  if (found == pools.end()) throw std::runtime_error(name + " not found");
  return *found;
}

}  // namespace Loader
