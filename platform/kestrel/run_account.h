// SPDX-License-Identifier: Apache-2.0
// What a process took from its store: counted while it runs, and reported when it exits. A run
// whose values may be old, or whose lookups failed, writes one line to the system log. Where the
// configuration names a file for it, the file describes the last run.
#pragma once

#include <string>

#include "kestrel/backend.h"
#include "kestrel/configuration.h"

namespace Kestrel {

struct RunCounts {
  long values = 0;    // fields that were found
  long defaults = 0;  // fields and objects that the store does not have
  long failures = 0;  // lookups that failed
  std::string error;  // the first failure
};

// "key = value" lines for the file, and the line for the system log; "": the log gets none.
std::string lastRunText(const std::string &program, const RunCounts &counts,
                        const RunSource &source);
std::string logLine(const RunCounts &counts, const RunSource &source);

// Writes both. Never fails: a program that has done its work does not fail for its report.
void reportRun(const Configuration &configuration, const RunCounts &counts,
               const RunSource &source) noexcept;

}  // namespace Kestrel
