// SPDX-License-Identifier: Apache-2.0
// Asks the processor and the running Linux. A command line that cannot be read (no /proc) is empty:
// the other facts do not need it.
#include "knob/machine_facts.h"

#include <sys/sysinfo.h>

#include <algorithm>
#include <system_error>

#include "common/read_file.h"

#if defined(__x86_64__) || defined(__i386__)
#include <cpuid.h>
#endif

namespace Knob {
namespace {

bool runsUnderHypervisor() {
#if defined(__x86_64__) || defined(__i386__)
  constexpr unsigned kFeatureLeaf = 1;
  constexpr unsigned kHypervisorBit = 1U << 31;
  unsigned a = 0, b = 0, c = 0, d = 0;
  return __get_cpuid(kFeatureLeaf, &a, &b, &c, &d) != 0 && (c & kHypervisorBit) != 0;
#else
  return false;
#endif
}

std::string bootCommandLine() {
  constexpr size_t kMaxBytes = size_t{64} * 1024;
  try {
    std::string line = Platform::readFile("/proc/cmdline", kMaxBytes);
    if (!line.empty() && line.back() == '\n') line.pop_back();
    return line;
  } catch (const std::system_error &) {
    return {};
  }
}

uint64_t physicalMemoryKB() {
  struct sysinfo info {};
  (void)::sysinfo(&info);  // fails only for a bad address
  return static_cast<uint64_t>(info.totalram) * info.mem_unit / 1024;
}

}  // namespace

HostFacts readMachineFacts() {
  HostFacts facts;
  facts.cpus = static_cast<uint32_t>(std::max(1, ::get_nprocs()));
  facts.isVm = runsUnderHypervisor();
  facts.memoryKB = physicalMemoryKB();
  facts.bootCommandLine = bootCommandLine();
  return facts;
}

}  // namespace Knob
