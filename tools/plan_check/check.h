// SPDX-License-Identifier: Apache-2.0
// The whole check: files, the pools together, the machine. For poolctl-plan and poolctl-install.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "plan_check/definition_check.h"
#include "plan_check/machine.h"
#include "plan_check/pool_tree.h"
#include "plan_check/report.h"

namespace Plan {

// What definitions are checked against.
struct Surroundings {
  Machine machine;
  std::optional<std::vector<KernelGroup>> groups;  // nothing: not known which groups there are
  std::vector<std::string> notes;                  // what could not be checked, and why
};

// This machine and its kernel. Without a usable kernel: the notes say so. Never throws for that.
Surroundings thisSurroundings();

// A machine that has just started, with the facts of that file. Throws as readMachine() does.
Surroundings surroundingsOf(const std::string &factsPath);

struct Checked {
  std::vector<DeclaredPool> pools;  // that the loader accepts, of all files
  Findings findings;                // in the order of the files, then of the places
  Sources sources;
};

// A file, and the name that findings give it.
struct NamedFile {
  std::string name;
  std::string path;
};

Checked checkFiles(const std::vector<NamedFile> &files, const Surroundings &surroundings);
Checked checkFiles(const std::vector<std::string> &paths, const Surroundings &surroundings);

// What is found in AFTER that concerns the files of these names: their own findings, and errors of
// other files that are not in BEFORE.
Findings findingsOfChange(const Checked &before, const Checked &after,
                          const std::vector<std::string> &names);

}  // namespace Plan
