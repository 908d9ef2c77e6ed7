// SPDX-License-Identifier: Apache-2.0
// Builds the variables from four kernel records, each of which is read once in the process.
#include "loader/host_facts.h"

#include <array>
#include <cstdint>
#include <cstring>
#include <string_view>

#include "platform/knob.h"
#include "yaml/exception.h"

namespace Loader {
namespace {

template <size_t Size>
using Record = std::array<char, Size>;

using CpuInfo = Record<38>;
using VmLimits = Record<32>;
using BootCommandLine = Record<4096>;
using MemoryInfo = Record<80>;

template <typename AnyRecord>
AnyRecord readRecord(KNOB_NodeID node) {
  AnyRecord record{};
  if (KNOB_Get(node, nullptr, record.data(), record.size()) != 0) {
    throw Exception(YAML::Mark::null_mark(), "KNOB_Get failed");
  }
  return record;
}

// Each record is a static of its own: one that was read is not read again when another fails.
const CpuInfo &cpuInfo() {
  static const auto record = readRecord<CpuInfo>(KNOB_NODE_hardware_cpu_cpuInfo);
  return record;
}

const VmLimits &vmLimits() {
  static const auto record = readRecord<VmLimits>(KNOB_NODE_system_vmLimits);
  return record;
}

const BootCommandLine &bootCommandLine() {
  static const auto record = readRecord<BootCommandLine>(KNOB_NODE_system_bootCmdLine);
  return record;
}

const MemoryInfo &memoryInfo() {
  static const auto record = readRecord<MemoryInfo>(KNOB_NODE_memory_comprehensive);
  return record;
}

template <typename Field, typename AnyRecord>
Field fieldAt(const AnyRecord &record, size_t offset) {
  Field field;
  std::memcpy(&field, record.data() + offset, sizeof field);
  return field;
}

bool isInstallerBoot(const BootCommandLine &commandLine) {
  const std::string_view text(commandLine.data(), strnlen(commandLine.data(), commandLine.size()));
  return text.find("runotter") != std::string_view::npos;
}

Calc::VariableTable readFacts() {
  const CpuInfo &cpu = cpuInfo();
  const VmLimits &limits = vmLimits();
  const BootCommandLine &commandLine = bootCommandLine();
  const MemoryInfo &memory = memoryInfo();
  return {
      {"numPCPUs", static_cast<float>(fieldAt<uint32_t>(cpu, 24))},
      {"maxVMs", static_cast<float>(fieldAt<uint32_t>(limits, 0))},
      {"isInstaller", isInstallerBoot(commandLine) ? 1.0F : 0.0F},
      {"isVm", static_cast<float>(fieldAt<uint8_t>(cpu, 36))},
      {"physKB", static_cast<float>(fieldAt<uint64_t>(memory, 0))},
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
