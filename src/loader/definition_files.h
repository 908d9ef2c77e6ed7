// SPDX-License-Identifier: Apache-2.0
// The definition files: which there are, which are installed, and the pools that they declare.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "loader/resource_pool.h"

namespace Loader {

using PoolList = std::vector<std::shared_ptr<ResourcePoolImpl>>;

// Where definition files are looked for when none is named.
constexpr const char *kDefinitionFolder = "/etc/rp.d";

// The names of the extended attribute that marks a file as installed, in the order in which they
// are tried: the first where the file system takes it, else the second. Its value is one byte, 1.
constexpr const char *kInstalledMarks[] = {"orrery.installed", "user.orrery.installed"};

// The paths of the folder's definition files, in no order. Throws std::system_error when the folder
// cannot be read.
std::vector<std::string> listDefinitionFolder();

// Whether the file carries the installed mark. A file that does not exist carries none.
bool isInstalled(const std::string &path);

// The pools of the named files, or of every file of the definition folder when none is named,
// sorted by name. Throws Loader::FileError, which names the file and holds its cause, or
// std::system_error when the folder cannot be read.
PoolList loadPools(const std::vector<std::string> &files, bool descending);

// The pools of one file in the order of the document, installed or not. Throws Loader::FileError.
PoolList readFile(const std::string &path);

// The first pool of exactly that name. Throws std::runtime_error when there is none.
std::shared_ptr<ResourcePoolImpl> findPool(const std::string &name, const PoolList &pools);

}  // namespace Loader
