// SPDX-License-Identifier: Apache-2.0
// Reads all definition files into one sorted list of pools.
#include "loader/definition_files.h"

#include <dirent.h>

#include <algorithm>
#include <cerrno>
#include <exception>
#include <system_error>

#include "loader/definition_file.h"
#include "loader/file_error.h"
#include "yaml/exception.h"

namespace Loader {
namespace {

struct CloseFolder {
  void operator()(DIR *folder) const { closedir(folder); }
};

[[noreturn]] void throwFolderError() {
  throw std::system_error(errno, std::generic_category(), kDefinitionFolder);
}

// More than any host has. Without bounds a small file with aliases could take all memory.
constexpr size_t kMaxPools = 100000;
constexpr size_t kMaxNameBytes = 64 * 1024 * 1024;

// Newer releases of the yaml library add the path, which the file error contains anyway.
std::string bareMessage(const YAML::Exception &error) {
  if (dynamic_cast<const YAML::BadFile *>(&error) != nullptr) return YAML::ErrorMsg::BAD_FILE;
  return error.msg;
}

// Runs BODY; what it throws becomes the nested cause of an error that names the file.
template <typename Body>
auto namingFile(const std::string &path, Body body) {
  try {
    return body();
  } catch (const YAML::Exception &error) {
    std::throw_with_nested(FileError(path, bareMessage(error), error.mark));
  } catch (const std::exception &error) {
    std::throw_with_nested(FileError(path, error.what(), YAML::Mark::null_mark()));
  }
}

[[noreturn]] void throwNotInstalled(const std::string &path) {
  throw FileError(path, "is not installed", YAML::Mark::null_mark());
}

// The pools of all files of a run.
class Run {
 public:
  void readInstalled(const std::string &path) {
    const char *const mark = installedMarkAt(path);
    if (mark == nullptr) throwNotInstalled(path);
    const auto file = namingFile(path, [&] { return std::make_unique<DefinitionFile>(path); });
    if (!file->hasMark(mark)) throwNotInstalled(path);
    namingFile(path, [&] { readPools(*file); });
  }

  void read(const std::string &path) {
    namingFile(path, [&] {
      DefinitionFile file(path);
      readPools(file);
    });
  }

  PoolList takePools() { return std::move(pools_); }

 private:
  void readPools(DefinitionFile &file) {
    const YAML::Node document = file.read();
    for (const auto &item : document) add(item);
  }

  void add(const YAML::Node &item) {
    auto pool = std::make_shared<ResourcePoolImpl>(item);
    nameBytes_ += pool->name.size();
    if (pools_.size() == kMaxPools) {
      throw Exception(item.Mark(), "more than " + std::to_string(kMaxPools) + " pools");
    }
    if (nameBytes_ > kMaxNameBytes) {
      throw Exception(item.Mark(), "names of pools take more than 64 MB");
    }
    pools_.push_back(std::move(pool));
  }

  PoolList pools_;
  size_t nameBytes_ = 0;
};

}  // namespace

// An entry's type is the one in the listing. Symbolic links, folders and entries of unknown type
// are skipped.
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
  return installedMarkAt(path) != nullptr;
}

PoolList readFile(const std::string &path) {
  Run run;
  run.read(path);
  return run.takePools();
}

PoolList loadPools(const std::vector<std::string> &files, bool descending) {
  Run run;
  for (const std::string &path : files.empty() ? listDefinitionFolder() : files) {
    run.readInstalled(path);
  }
  PoolList pools = run.takePools();
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
