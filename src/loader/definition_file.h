// SPDX-License-Identifier: Apache-2.0
// One definition file: opened once, so that its mark and its content are those of the same file
// even if another process replaces the path in between.
#pragma once

#include <yaml-cpp/yaml.h>

#include <ext/stdio_filebuf.h>
#include <string>

namespace Loader {

// The name under which the file at PATH carries the installed mark; null if it does not.
const char *installedMarkAt(const std::string &path) noexcept;

class DefinitionFile {
 public:
  // Opens the file without waiting for the writer of a FIFO. Throws YAML::BadFile if the file
  // cannot be opened or is neither a regular file nor a folder, and Loader::Exception if it is
  // larger than 64 MB.
  explicit DefinitionFile(const std::string &path);

  // Whether this file carries the mark under the name that installedMarkAt found.
  bool hasMark(const char *name) noexcept;

  // The first document. Throws the yaml library's errors, and std::ios_base::failure if the file
  // cannot be read, as for a folder. Call it once.
  YAML::Node read();

 private:
  __gnu_cxx::stdio_filebuf<char> content_;
};

}  // namespace Loader
