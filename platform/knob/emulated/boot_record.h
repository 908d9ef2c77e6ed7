// SPDX-License-Identifier: Apache-2.0
// A copy of what a boot fixed, in a small file beside the state. Programs that only ask for facts
// or the signature, as every start of one does, read it and need not open the state at all.
//
// The state is the truth: a boot removes the copy before it changes the state, and makes a new one
// after. Without a copy the state is asked.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "knob/kernel.h"

namespace Knob {

struct BootRecord {
  HostFacts facts;                 // but maxVms
  std::optional<uint32_t> maxVms;  // absent: the configuration's
  BuildSignature signature;
};

// The copy that belongs to the state at that path; nothing when there is none.
std::optional<BootRecord> readBootRecord(const std::string &statePath);

// Under the boot's lock. A copy that cannot be written is done without.
void removeBootRecord(const std::string &statePath);
void writeBootRecord(const std::string &statePath, const BootRecord &record);

}  // namespace Knob
