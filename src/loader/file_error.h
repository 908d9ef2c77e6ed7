// SPDX-License-Identifier: Apache-2.0
// The error that names a definition file.
#pragma once

#include <yaml-cpp/mark.h>

#include <stdexcept>
#include <string>

namespace Loader {

// what(): the path, the line and column (counted from 1) unless the mark is null, and the message.
class FileError : public std::runtime_error {
 public:
  FileError(const std::string &path, const std::string &message, const YAML::Mark &mark);
};

}  // namespace Loader
