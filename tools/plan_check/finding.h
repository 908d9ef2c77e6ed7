// SPDX-License-Identifier: Apache-2.0
// What a check found.
#pragma once

#include <string>
#include <vector>

#include "plan_check/source_file.h"

namespace Plan {

enum class Severity {
  kError,    // poolctl refuses it, when it reads the file or when it loads the pools
  kWarning,  // it is accepted, and probably not what was meant
};

struct Finding {
  Severity severity = Severity::kError;
  std::string code;  // names the cause; scripts may compare it
  std::string file;
  Place place;
  std::string pool;       // the pool's path; empty: none, or not known
  std::string message;    // what is wrong
  std::string expected;   // what is valid there; may be empty
  std::string advice;     // what to write instead; may be empty
  bool isAtLoad = false;  // an error: the file can be read, but the pools cannot be loaded
};

using Findings = std::vector<Finding>;

}  // namespace Plan
