// SPDX-License-Identifier: Apache-2.0
// Findings for people and for programs.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "plan_check/finding.h"

namespace Plan {

using Sources = std::map<std::string, std::shared_ptr<const SourceFile>>;

// A finding in up to five lines: "FILE:LINE:COLUMN: error: MESSAGE [CODE]", the source line with a
// caret, and what is expected. Control characters are escaped.
std::string findingText(const Finding &finding, const Sources &sources);

// All findings as one JSON document of docs/poolctl-plan.schema.json.
std::string findingsJson(const Findings &findings, const Sources &sources,
                         const std::vector<std::string> &notes);

// How many are of that severity.
size_t count(const Findings &findings, Severity severity);

}  // namespace Plan
