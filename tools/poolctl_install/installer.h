// SPDX-License-Identifier: Apache-2.0
// What poolctl-install does, each for several files at once: all of them, or none.
#pragma once

#include <string>
#include <vector>

#include "folder_check.h"

namespace Install {

// Each throws a std::exception whose what() is a message for users and names the file. Everything
// that was done is undone then; what cannot be undone is reported on standard error. SIGINT,
// SIGTERM and SIGHUP are held back meanwhile, and take effect between two files.

// Copies each file into the definition folder under its own name, after the check of poolctl-plan.
// Errors that it finds are refused or, like its warnings, only reported.
void installFiles(const std::vector<std::string> &paths, Errors errors);

// Marks each file where it is, after the loader has accepted it.
void markFiles(const std::vector<std::string> &paths);

// Removes the installed files of these names.
void removeFiles(const std::vector<std::string> &names);

}  // namespace Install
