// SPDX-License-Identifier: Apache-2.0
// A temporary folder, removed when the test ends, and helpers for the files in it.
#pragma once

#include <filesystem>
#include <string>
#include <string_view>

namespace Test {

class TempFolder {
 public:
  // Created in TMPDIR, or in /tmp.
  TempFolder();
  TempFolder(const TempFolder &) = delete;
  TempFolder &operator=(const TempFolder &) = delete;
  ~TempFolder();

  const std::filesystem::path &path() const { return path_; }

 private:
  std::filesystem::path path_;
};

void writeFile(const std::filesystem::path &path, std::string_view content);

// The file's content; empty when the file cannot be read.
std::string readFile(const std::filesystem::path &path);

// Sets the attribute that marks a definition file as installed, under the name that the file system
// supports. Throws std::system_error when it supports neither.
void setInstalledMark(const std::filesystem::path &path, std::string_view value = "\x01");

}  // namespace Test
