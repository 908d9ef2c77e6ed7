// SPDX-License-Identifier: Apache-2.0
// Puts the parts together; each part knows nothing of the others.
#include "plan_check/check.h"

#include <algorithm>
#include <exception>
#include <iterator>
#include <tuple>
#include <utility>

#include "knob/session.h"
#include "plan_check/set_check.h"

namespace Plan {
namespace {

constexpr const char *kAdvice =
    "values and the groups in the kernel are not checked: `knobctl status` reports the reason, "
    "--facts FILE gives the facts of a machine";

// By file in the given order, then by place.
void sortFindings(const std::vector<std::string> &paths, Findings *findings) {
  const auto indexOf = [&paths](const std::string &file) {
    return std::find(paths.begin(), paths.end(), file) - paths.begin();
  };
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

Checked checkFiles(const std::vector<std::string> &paths, const Surroundings &surroundings) {
  Checked checked;
  for (const std::string &path : paths) {
    CheckedFile file = checkFile(path, surroundings.machine.facts);
    checked.sources[path] = file.source;
    std::move(file.findings.begin(), file.findings.end(), std::back_inserter(checked.findings));
    std::move(file.pools.begin(), file.pools.end(), std::back_inserter(checked.pools));
  }
  Findings ofSet = checkSet(checked.pools, surroundings.machine, surroundings.groups);
  std::move(ofSet.begin(), ofSet.end(), std::back_inserter(checked.findings));
  sortFindings(paths, &checked.findings);
  return checked;
}

}  // namespace Plan
