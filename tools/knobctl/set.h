// SPDX-License-Identifier: Apache-2.0
// `knobctl set`: changes what one group may have.
#pragma once

#include <CLI/App.hpp>
#include <cstdint>
#include <string>

#include "knob/kernel.h"

namespace Knobctl {

struct SetOptions {
  Knob::AllocationChange memory, cpu;
};

void declareSetOptions(CLI::App &command, SetOptions *options);

// Changes memory, then CPU, each whole or not at all. When the CPU is refused, the memory is set
// back. Throws Failure.
void setAllocations(const std::string &path, const SetOptions &options);

// A number, or "low", "normal" or "high".
std::string sharesText(int64_t shares);

}  // namespace Knobctl
