// SPDX-License-Identifier: Apache-2.0
// Whether a kernel accepts a pool's name, and whether the name is likely to be the one meant.
#pragma once

#include <optional>
#include <string>

#include "plan_check/cause.h"

namespace Plan {

struct NameProblem {
  bool isRefused = false;  // by every kernel, at load
  Cause cause;
};

// NAME: as written. PATH: the full group path that the loader makes of it.
std::optional<NameProblem> nameProblem(const std::string &name, const std::string &path);

}  // namespace Plan
