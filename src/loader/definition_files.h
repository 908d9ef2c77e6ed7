// SPDX-License-Identifier: Apache-2.0
// Finds the definition files, checks that they are installed, and reads the pools that they
// declare.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "loader/resource_pool.h"

namespace Loader {

using PoolList = std::vector<std::shared_ptr<ResourcePoolImpl>>;

// The folder of the definition files.
constexpr const char *kDefinitionFolder = "/etc/rp.d";

// The names of the extended attribute that marks a file as installed; its value is one byte, 1. The
// second name counts only where the file system does not support the first.
constexpr const char *kInstalledMarks[] = {"orrery.installed", "user.orrery.installed"};

// The paths of the files of the definition folder, in no fixed order. Throws std::system_error if
// the folder cannot be read.
std::vector<std::string> listDefinitionFolder();

// Whether the file at that path carries the installed mark. A file that does not exist does not.
bool isInstalled(const std::string &path);

// The pools of the named files, or of all files in the definition folder if none is named, sorted
// by name. Pools of equal names are in no fixed order. Throws Loader::FileError, which names the
// file and holds the cause as a nested exception, or std::system_error if the folder cannot be
// read. Bounds of one call: 64 MB a file, 100,000 pools, and 64 MB for their names.
PoolList loadPools(const std::vector<std::string> &files, bool descending);

// The pools of one file in the order of the document, within the same bounds. The installed mark is
// not checked. Throws Loader::FileError.
PoolList readFile(const std::string &path);

// The first pool whose name is exactly that. Throws std::runtime_error if there is none.
std::shared_ptr<ResourcePoolImpl> findPool(const std::string &name, const PoolList &pools);

}  // namespace Loader
