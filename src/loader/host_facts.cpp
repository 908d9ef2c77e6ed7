// SPDX-License-Identifier: Apache-2.0
// Builds the variables from four kernel records, each of which is read once in the process.
#include "loader/host_facts.h"

#include <cstring>
#include <string_view>

#include "platform/knob.h"
#include "platform/knob_records.h"
#include "yaml/exception.h"

namespace Loader {
namespace {

template <typename Record>
Record readRecord(KNOB_NodeID node) {
  Record record{};
  if (KNOB_Get(node, nullptr, &record, sizeof record) != 0) {
    throw Exception(YAML::Mark::null_mark(), "KNOB_Get failed");
  }
  return record;
}

// Each record is a static of its own: one that was read is not read again when another fails.
const KNOB_CpuInfo &cpuInfo() {
  static const auto record = readRecord<KNOB_CpuInfo>(KNOB_NODE_hardware_cpu_cpuInfo);
  return record;
}

const KNOB_VmLimits &vmLimits() {
  static const auto record = readRecord<KNOB_VmLimits>(KNOB_NODE_system_vmLimits);
  return record;
}

const KNOB_BootCommandLine &bootCommandLine() {
  static const auto record = readRecord<KNOB_BootCommandLine>(KNOB_NODE_system_bootCmdLine);
  return record;
}

const KNOB_MemoryInfo &memoryInfo() {
  static const auto record = readRecord<KNOB_MemoryInfo>(KNOB_NODE_memory_comprehensive);
  return record;
}

bool isInstallerBoot(const KNOB_BootCommandLine &commandLine) {
  const std::string_view text(commandLine.text, strnlen(commandLine.text, sizeof commandLine.text));
  return text.find("runotter") != std::string_view::npos;
}

Calc::VariableTable readFacts() {
  const KNOB_CpuInfo &cpu = cpuInfo();
  const KNOB_VmLimits &limits = vmLimits();
  const KNOB_BootCommandLine &commandLine = bootCommandLine();
  const KNOB_MemoryInfo &memory = memoryInfo();
  return {
      {"numPCPUs", static_cast<float>(cpu.cpus)},
      {"maxVMs", static_cast<float>(limits.maxVms)},
      {"isInstaller", isInstallerBoot(commandLine) ? 1.0F : 0.0F},
      {"isVm", static_cast<float>(cpu.isVm)},
      {"physKB", static_cast<float>(memory.physicalKB)},
      // Flags of the kernel's build. They are fixed and not read from the kernel.
      {"nucdefs.nux86_debug", 0.0F},
      {"nucdefs.GCOV_NUCLEUS", 0.0F},
  };
}

}  // namespace

const Calc::VariableTable &hostFacts() {
  static const Calc::VariableTable facts = readFacts();
  return facts;
}

}  // namespace Loader
