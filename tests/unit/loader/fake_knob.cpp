// SPDX-License-Identifier: Apache-2.0
// Stands in for the platform's library under the names that it exports.
#include "fake_knob.h"

#include <algorithm>
#include <cstring>

#include "platform/knob_records.h"

extern "C" {
extern const KNOB_NodeID KNOB_NODE_hardware_cpu_cpuInfo = 101;
extern const KNOB_NodeID KNOB_NODE_system_vmLimits = 102;
extern const KNOB_NodeID KNOB_NODE_system_bootCmdLine = 103;
extern const KNOB_NodeID KNOB_NODE_memory_comprehensive = 104;
}

namespace {

// The records are packed, so they may be at any address.
void fill(const FakeKnob &knob, KNOB_NodeID node, char *record, size_t size) {
  std::memset(record, knob.filler, size);
  if (node == KNOB_NODE_hardware_cpu_cpuInfo) {
    auto *cpu = reinterpret_cast<KNOB_CpuInfo *>(record);
    cpu->cpus = knob.physicalCpus;
    cpu->isVm = knob.isVm;
  } else if (node == KNOB_NODE_system_vmLimits) {
    reinterpret_cast<KNOB_VmLimits *>(record)->maxVms = knob.maxVMs;
  } else if (node == KNOB_NODE_memory_comprehensive) {
    reinterpret_cast<KNOB_MemoryInfo *>(record)->physicalKB = knob.physKB;
  } else {
    const size_t length = std::min(knob.commandLine.size(), size);
    std::memcpy(record, knob.commandLine.data(), length);
    if (knob.terminated && length < size) record[length] = '\0';
  }
}

}  // namespace

FakeKnob &FakeKnob::instance() {
  static FakeKnob knob;
  return knob;
}

KNOB_ReturnStatus KNOB_Get(KNOB_NodeID node, const KNOB_ParamList *instance, void *output,
                           size_t outputSize) {
  FakeKnob &knob = FakeKnob::instance();
  knob.calls.push_back({node, instance != nullptr, outputSize});
  const auto failure = knob.failures.find(node);
  if (failure != knob.failures.end()) return failure->second;
  fill(knob, node, static_cast<char *>(output), outputSize);
  return 0;
}

const char *NUC_ReturnStatusToString(KNOB_ReturnStatus) {
  return "the kernel's text";
}
