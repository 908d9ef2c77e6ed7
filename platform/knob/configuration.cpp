// SPDX-License-Identifier: Apache-2.0
// The keys of knob.conf.
#include "knob/configuration.h"

#include <cstdlib>
#include <limits>

#include "common/key_value_file.h"

namespace Knob {
namespace {

constexpr const char *kDefaultFile = "/etc/knob.conf";
constexpr const char *kFileVariable = "KNOB_CONF";
constexpr std::string_view kLinuxName = "linux";

}  // namespace

std::optional<Configuration> readConfigurationFile(const std::string &fileName) {
  const auto file = Platform::KeyValueFile::read(
      fileName, {"kernel", "state", "cgroup-root", "max-vms", "reserve-memory", "reserve-cpu"});
  if (!file) return std::nullopt;

  Configuration configuration;
  configuration.source = fileName;
  if (file->oneOf("kernel", {"emulated", kLinuxName}) == kLinuxName) {
    configuration.kernel = Configuration::KernelKind::kLinux;
  }
  configuration.statePath = file->absolutePath("state");
  configuration.cgroupRoot = file->text("cgroup-root").value_or("");
  constexpr int64_t kMaxVms = std::numeric_limits<uint32_t>::max();
  if (const auto maxVms = file->integer("max-vms", 0, kMaxVms)) {
    configuration.maxVms = static_cast<uint32_t>(*maxVms);
  }
  constexpr int64_t kMaxReserve = std::numeric_limits<int32_t>::max();
  configuration.reserve.memoryMB = file->integer("reserve-memory", 0, kMaxReserve);
  configuration.reserve.cpuPercent = file->integer("reserve-cpu", 0, kMaxReserve);
  return configuration;
}

Configuration readConfiguration() {
  // A program that runs with more rights than its caller must not take its kernel from the caller.
  const char *named = ::secure_getenv(kFileVariable);
  if (named == nullptr || *named == '\0') {
    return readConfigurationFile(kDefaultFile).value_or(Configuration());
  }
  auto configuration = readConfigurationFile(named);
  if (!configuration) {
    throw Platform::ConfigError(std::string(named) + ": no such file (named by " + kFileVariable +
                                ")");
  }
  return *configuration;
}

}  // namespace Knob
