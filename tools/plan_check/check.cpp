// SPDX-License-Identifier: Apache-2.0
// Puts the parts together; each part knows nothing of the others.
#include "plan_check/check.h"

#include <algorithm>
#include <exception>
#include <iterator>
#include <map>
#include <set>
#include <tuple>
#include <utility>

#include "knob/session.h"
#include "plan_check/set_check.h"

namespace Plan {
namespace {

constexpr const char *kAdvice =
    "values, parents and the machine's room are not checked: see `knobctl status`, or check for a "
    "machine whose facts are in a file with `poolctl-plan check --facts FILE`";

// By file in the given order, then by place.
void sortFindings(const std::vector<NamedFile> &files, Findings *findings) {
  std::map<std::string, size_t> order;
  for (const NamedFile &file : files) order.emplace(file.name, order.size());
  const auto indexOf = [&order](const std::string &file) { return order.at(file); };
  std::stable_sort(findings->begin(), findings->end(), [&](const Finding &a, const Finding &b) {
    return std::tuple(indexOf(a.file), a.place.line, a.place.column) <
           std::tuple(indexOf(b.file), b.place.line, b.place.column);
  });
}

}  // namespace

Surroundings thisSurroundings() {
  Surroundings surroundings;
  std::string reason;
  try {
    const auto kernel = Knob::openConfiguredKernel();
    surroundings.machine = thisMachine(*kernel);
    surroundings.groups = readGroups(*kernel);
    return surroundings;
  } catch (const std::exception &error) {
    reason = error.what();
  }
  surroundings = Surroundings();
  surroundings.machine = unknownMachine();
  surroundings.notes = {"no usable kernel: " + reason, kAdvice};
  return surroundings;
}

Surroundings surroundingsOf(const std::string &factsPath) {
  Surroundings surroundings;
  surroundings.machine = readMachine(factsPath);
  surroundings.groups.emplace();
  return surroundings;
}

Checked checkFiles(const std::vector<NamedFile> &files, const Surroundings &surroundings) {
  Checked checked;
  for (const NamedFile &named : files) {
    CheckedFile file = checkFile(named.path, named.name, surroundings.machine.facts);
    checked.sources[named.name] = file.source;
    std::move(file.findings.begin(), file.findings.end(), std::back_inserter(checked.findings));
    std::move(file.pools.begin(), file.pools.end(), std::back_inserter(checked.pools));
  }
  Findings ofSet = checkSet(checked.pools, surroundings.machine, surroundings.groups);
  std::move(ofSet.begin(), ofSet.end(), std::back_inserter(checked.findings));
  sortFindings(files, &checked.findings);
  return checked;
}

Checked checkFiles(const std::vector<std::string> &paths, const Surroundings &surroundings) {
  std::vector<NamedFile> files;
  for (const std::string &path : paths) files.push_back({path, path});
  return checkFiles(files, surroundings);
}

Findings findingsOfChange(const Checked &before, const Checked &after,
                          const std::vector<std::string> &names) {
  const auto key = [](const Finding &finding) {
    return std::tuple(finding.file, finding.code, finding.pool);
  };
  std::set<std::tuple<std::string, std::string, std::string>> known;
  for (const Finding &finding : before.findings) known.insert(key(finding));
  Findings found;
  for (const Finding &finding : after.findings) {
    const bool own = std::find(names.begin(), names.end(), finding.file) != names.end();
    const bool isNew = finding.severity == Severity::kError && known.count(key(finding)) == 0;
    if (own || isNew) found.push_back(finding);
  }
  return found;
}

}  // namespace Plan
