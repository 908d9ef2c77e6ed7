// SPDX-License-Identifier: Apache-2.0
#include "cli_fixture.h"

namespace Test {

std::string tableLine(const std::vector<std::string> &columns) {
  std::string line = columns.at(0);
  if (line.size() < 48) line.append(48 - line.size(), ' ');
  for (size_t i = 1; i < columns.size(); ++i) {
    line += '\0';
    if (columns[i].size() < 12) line.append(12 - columns[i].size(), ' ');
    line += columns[i];
  }
  return line + '\n';
}

}  // namespace Test
