// SPDX-License-Identifier: Apache-2.0
// The check of definitions before they are installed: the same as that of poolctl-plan.
#pragma once

#include <string>
#include <vector>

#include "plan_check/check.h"

namespace Install {

// A file that is about to get a name in the folder.
struct NewFile {
  std::string entry;   // its name there
  std::string source;  // the user's file, which messages name
  std::string staged;  // the copy, which is what is checked
};

enum class Errors { kRefuse, kReport };

// The check of a folder that is about to change.
class FolderCheck {
 public:
  explicit FolderCheck(std::vector<NewFile> files);

  // Prints what is found in the files and, where they are the cause, in the others of the folder.
  // Throws Tools::Failure when there are errors and they are to be refused.
  void run(Errors errors);

  // Prints which pools of the files are loaded with other values, which no load changes.
  void reportLoadedPools() const;

 private:
  std::vector<NewFile> files_;
  Plan::Surroundings surroundings_;
  Plan::Checked after_;
};

}  // namespace Install
