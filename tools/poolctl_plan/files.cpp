// SPDX-License-Identifier: Apache-2.0
// Files that are named need no installed mark: they are checked before they are installed.
#include "poolctl_plan/files.h"

#include <algorithm>

#include "loader/definition_files.h"

namespace Plan {

std::vector<std::string> pathsOf(const Input &input) {
  if (!input.files.empty()) return input.files;
  std::vector<std::string> paths = Loader::listDefinitionFolder();
  std::sort(paths.begin(), paths.end());
  return paths;
}

Surroundings surroundingsOf(const Input &input) {
  return input.factsPath.empty() ? thisSurroundings() : surroundingsOf(input.factsPath);
}

Checked checkInput(const Input &input, const Surroundings &surroundings) {
  const std::vector<std::string> paths = pathsOf(input);
  Checked checked = checkFiles(paths, surroundings);
  if (!input.files.empty()) return checked;
  Findings unmarked;
  for (const std::string &path : paths) {
    if (Loader::isInstalled(path)) continue;
    unmarked.push_back({Severity::kError, "not-installed", path, Place(), "",
                        "the file does not carry the installed mark", "",
                        "install it with poolctl-install, or remove it", false});
  }
  checked.findings.insert(checked.findings.begin(), unmarked.begin(), unmarked.end());
  return checked;
}

}  // namespace Plan
