// SPDX-License-Identifier: Apache-2.0
// A folder of the test's own, gone when the test ends; and the marks and texts of files in it.
#pragma once

#include <filesystem>
#include <string>
#include <string_view>

namespace Test {

class TempFolder {
 public:
  // Made in TMPDIR, or in /tmp.
  TempFolder();
  TempFolder(const TempFolder &) = delete;
  TempFolder &operator=(const TempFolder &) = delete;
  ~TempFolder();

  const std::filesystem::path &path() const { return path_; }

 private:
  std::filesystem::path path_;
};

void writeFile(const std::filesystem::path &path, std::string_view content);

// The file's content; empty when there is no such file.
std::string readFile(const std::filesystem::path &path);

// Sets the attribute by which a definition file counts as installed, under the name that the file
// system takes. Throws std::system_error when it takes neither.
void setInstalledMark(const std::filesystem::path &path, std::string_view value = "\x01");

}  // namespace Test
