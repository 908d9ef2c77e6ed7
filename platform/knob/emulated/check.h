// SPDX-License-Identifier: Apache-2.0
// Recounts what the emulated kernel keeps.
#pragma once

#include <string>
#include <vector>

#include "common/sqlite.h"
#include "knob/kernel.h"

namespace Knob {

// Inside a transaction of the caller's, for writing where repair is wanted. path: of the state.
std::vector<Finding> checkState(Platform::Database &database, const std::string &path, bool repair);

}  // namespace Knob
