// SPDX-License-Identifier: Apache-2.0
// Compares the check of the folder as it is with that of the folder as it will be: what was wrong
// before does not keep a file from being installed.
#include "folder_check.h"

#include <algorithm>
#include <iostream>
#include <set>
#include <utility>

#include "loader/definition_files.h"
#include "plan_check/comparison.h"
#include "shared/text.h"
#include "shared/tool.h"

namespace Install {
namespace {

void print(const char *kind, const std::string &text) {
  std::cerr << "poolctl-install: " << kind << ": " << Tools::printable(text) << '\n';
}

std::vector<std::string> sourcesOf(const std::vector<NewFile> &files) {
  std::vector<std::string> sources;
  for (const NewFile &file : files) sources.push_back(file.source);
  return sources;
}

}  // namespace

FolderCheck::FolderCheck(std::vector<NewFile> files)
    : files_(std::move(files)), surroundings_(Plan::thisSurroundings()) {}

void FolderCheck::run(Errors errors) {
  for (const std::string &note : surroundings_.notes) print("note", note);
  std::set<std::string> replaced;
  for (const NewFile &file : files_) {
    replaced.insert(std::string(Loader::kDefinitionFolder) + "/" + file.entry);
  }
  std::vector<Plan::NamedFile> before;
  std::vector<Plan::NamedFile> after;
  for (const std::string &path : Loader::listDefinitionFolder()) {
    before.push_back({path, path});
    if (replaced.count(path) == 0) after.push_back({path, path});
  }
  for (const NewFile &file : files_) after.push_back({file.source, file.staged});
  after_ = Plan::checkFiles(after, surroundings_);
  Plan::Findings findings =
      Plan::findingsOfChange(Plan::checkFiles(before, surroundings_), after_, sourcesOf(files_));
  for (Plan::Finding &finding : findings) {
    // poolctl-plan apply can make room, and a restart of the machine does.
    if (finding.code == "no-room-now") finding.severity = Plan::Severity::kWarning;
    std::cerr << Plan::findingText(finding, after_.sources);
  }
  const size_t refused = Plan::count(findings, Plan::Severity::kError);
  if (refused == 0 || errors == Errors::kReport) return;
  throw Tools::Failure(Tools::kExitFailure,
                       std::to_string(refused) + (refused == 1 ? " error" : " errors") +
                           "; nothing is installed (--force installs all the same)");
}

void FolderCheck::reportLoadedPools() const {
  if (!surroundings_.groups) return;
  const std::vector<std::string> sources = sourcesOf(files_);
  std::vector<Plan::DeclaredPool> own;
  for (const Plan::DeclaredPool &pool : after_.pools) {
    if (std::find(sources.begin(), sources.end(), pool.file) != sources.end()) own.push_back(pool);
  }
  std::string last;
  for (const Plan::Difference &difference :
       Plan::compare(own, *surroundings_.groups, Plan::Undeclared::kLeaveOut)) {
    const bool loaded = difference.kind == Plan::Difference::Kind::kValue ||
                        difference.kind == Plan::Difference::Kind::kHalfMade;
    if (!loaded || difference.path == last) continue;
    last = difference.path;
    print("note", last +
                      " is loaded with other values and keeps them; poolctl-plan diff shows "
                      "them, and poolctl-plan apply changes them");
  }
}

}  // namespace Install
