// SPDX-License-Identifier: Apache-2.0
// Definitions evaluated for many machines, whose facts are in files.
#pragma once

#include <string>
#include <vector>

namespace Plan {

// Of one file of facts.
struct FactTest {
  std::string name;                   // the file without its folder and ".facts"
  std::vector<std::string> problems;  // why the set does not load there; empty: it does
  std::vector<std::string> changes;   // lines of the table that differ, "-expected" and "+actual"
};

enum class Tables { kCompare, kWrite };

// Evaluates the files for each NAME.facts of the folder. Where there is a NAME.csv, the pools must
// come to that table, which is what `poolctl list -v` prints; kWrite makes or replaces these files.
// Throws std::runtime_error for a folder or file that cannot be read, or a folder without facts.
std::vector<FactTest> runFactTests(const std::string &folder, const std::vector<std::string> &files,
                                   Tables tables);

}  // namespace Plan
