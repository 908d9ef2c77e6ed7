// SPDX-License-Identifier: Apache-2.0
// The text of every error in a definition file.
#include "loader/file_error.h"

namespace Loader {
namespace {

bool isNullMark(const YAML::Mark &mark) {
  return mark.pos == -1 && mark.line == -1 && mark.column == -1;
}

std::string place(const YAML::Mark &mark) {
  if (isNullMark(mark)) return {};
  return "line " + std::to_string(mark.line + 1) + " column " + std::to_string(mark.column + 1) +
         ": ";
}

}  // namespace

FileError::FileError(const std::string &path, const std::string &message, const YAML::Mark &mark)
    : std::runtime_error(path + ": " + place(mark) + message) {}

}  // namespace Loader
