// SPDX-License-Identifier: Apache-2.0
// The kernel's facts for tests, in the place of the platform's library: four records, failures on
// demand, and a record of what was asked.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "platform/knob.h"

struct FakeKnob {
  // The kernel that KNOB_Get asks.
  static FakeKnob &instance();

  uint32_t physicalCpus = 8;
  uint8_t isVm = 0;
  uint32_t maxVMs = 1024;
  uint64_t physKB = 16777216;
  std::string commandLine = "quiet";

  // What stands in the bytes that hold no fact.
  char filler = 0;

  // Whether the boot command line ends with a NUL or fills its record.
  bool terminated = true;

  // The status of each node that fails.
  std::map<KNOB_NodeID, KNOB_ReturnStatus> failures;

  // One KNOB_Get.
  struct Call {
    KNOB_NodeID node;
    bool hasInstance;
    size_t outputSize;
  };
  std::vector<Call> calls;
};
