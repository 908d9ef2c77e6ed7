// SPDX-License-Identifier: Apache-2.0
// A fact file is a YAML mapping: the facts that expressions know, and the capacities of the kernel.
#include "plan_check/machine.h"

#include <yaml-cpp/yaml.h>

#include <array>
#include <cmath>
#include <cstdlib>
#include <optional>
#include <stdexcept>

#include "knob/admission.h"
#include "loader/host_facts.h"
#include "plan_check/suggestion.h"

namespace Plan {
namespace {

constexpr const char *kMemoryCapacity = "memoryCapacityMB";
constexpr const char *kCpuCapacity = "cpuCapacityPercent";

// The facts that differ between machines, in the order in which they are written.
constexpr std::array kFacts = {"numPCPUs", "physKB", "maxVMs", "isVm", "isInstaller"};

// Flags of the kernel's build, which are 0 on every machine.
constexpr std::array kConstants = {"nucdefs.nux86_debug", "nucdefs.GCOV_NUCLEUS"};

std::runtime_error fileError(const std::string &path, const std::string &reason) {
  return std::runtime_error(path + ": " + reason);
}

std::string wholeNumber(double value) {
  return std::to_string(static_cast<unsigned long long>(value));
}

double numberOf(const std::string &path, const std::string &name, const YAML::Node &value) {
  const std::string text = value.IsScalar() ? value.Scalar() : "";
  char *end = nullptr;
  const double number = std::strtod(text.c_str(), &end);
  const bool bad = text.empty() || *end != '\0' || !std::isfinite(number) || number < 0;
  if (bad) throw fileError(path, name + " is not a number from 0 up");
  return number;
}

// Takes one entry of the file.
void readFact(const std::string &path, const std::string &name, const YAML::Node &value,
              Machine *machine) {
  const double number = numberOf(path, name, value);
  if (name == kMemoryCapacity) {
    machine->memoryMB = static_cast<int64_t>(number);
  } else if (name == kCpuCapacity) {
    machine->cpuPercent = static_cast<int64_t>(number);
  } else if (machine->facts.count(name) > 0) {
    throw fileError(path, name + " is given twice");
  } else {
    machine->facts[name] = static_cast<float>(number);
  }
}

bool isFact(const std::string &name) {
  for (const char *const fact : kFacts) {
    if (name == fact) return true;
  }
  return name == kMemoryCapacity || name == kCpuCapacity;
}

void completeFacts(const std::string &path, Machine *machine) {
  for (const char *const fact : kFacts) {
    if (machine->facts.count(fact) == 0) throw fileError(path, std::string(fact) + " is missing");
  }
  for (const char *const constant : kConstants) machine->facts[constant] = 0.0F;
  const double physKB = machine->facts["physKB"];
  const double cpus = machine->facts["numPCPUs"];
  if (machine->memoryMB < 0) machine->memoryMB = static_cast<int64_t>(physKB / 1024);
  if (machine->cpuPercent < 0) machine->cpuPercent = static_cast<int64_t>(cpus * 100);
}

}  // namespace

Machine thisMachine(Knob::Kernel &kernel) {
  const Knob::HostFacts facts = kernel.facts();
  return {true, Loader::hostFacts(), Knob::machineCapacity(facts, Knob::Resource::kMemory),
          Knob::machineCapacity(facts, Knob::Resource::kCpu)};
}

Machine unknownMachine() {
  Machine machine;
  for (const char *const fact : kFacts) machine.facts[fact] = 1.0F;
  for (const char *const constant : kConstants) machine.facts[constant] = 0.0F;
  return machine;
}

std::string machineText(const Machine &machine) {
  std::string text;
  for (const char *const fact : kFacts) {
    text += std::string(fact) + ": " + wholeNumber(double{machine.facts.at(fact)}) + "\n";
  }
  text += std::string(kMemoryCapacity) + ": " + std::to_string(machine.memoryMB) + "\n";
  return text + kCpuCapacity + ": " + std::to_string(machine.cpuPercent) + "\n";
}

Machine readMachine(const std::string &path) {
  YAML::Node file;
  try {
    file = YAML::LoadFile(path);
  } catch (const YAML::Exception &) {
    throw fileError(path, "cannot be read as a file of facts");
  }
  if (!file.IsMap())
    throw fileError(path, "not a mapping of facts (poolctl-plan facts writes one)");
  Machine machine;
  machine.isKnown = true;
  machine.memoryMB = machine.cpuPercent = -1;
  for (const auto &entry : file) {
    const std::string name = entry.first.IsScalar() ? entry.first.Scalar() : "";
    if (!isFact(name)) {
      throw fileError(path, "unknown fact \"" + name + "\"; known are " +
                                joined({kFacts.begin(), kFacts.end()}) + ", " + kMemoryCapacity +
                                " and " + kCpuCapacity);
    }
    readFact(path, name, entry.second, &machine);
  }
  completeFacts(path, &machine);
  return machine;
}

}  // namespace Plan
