// SPDX-License-Identifier: Apache-2.0
// Puts the emulated kernel under the contract's cases: a state in a temporary folder.
#include <unistd.h>

#include <cstdlib>

#include "kernel_under_test.h"
#include "knob/emulated/boot.h"
#include "knob/emulated/emulated_kernel.h"
#include "temp_folder.h"

namespace Contract {
namespace {

class EmulatedUnderTest final : public KernelUnderTest {
 public:
  EmulatedUnderTest() {
    configuration_.statePath = folder_.path() / "kernel.db";
    const auto file = folder_.path() / "knob.conf";
    Test::writeFile(file, "state = " + *configuration_.statePath + "\n");
    ::setenv("KNOB_CONF", file.c_str(), 1);
  }

  void startAnew() override {
    Knob::BootFacts facts;
    facts.cpus = kCpus;
    facts.memoryMB = kMemoryMB;
    facts.maxVms = kMaxVms;
    facts.isVm = true;
    facts.commandLine = kCommandLine;
    Knob::bootEmulatedKernel(configuration_, facts, true);
  }

  std::vector<std::string> check(bool repair) override {
    std::vector<std::string> lines;
    for (const Knob::Finding &finding : Knob::openEmulatedKernel(configuration_)->check(repair)) {
      lines.push_back(finding.path + ": " + finding.text);
    }
    return lines;
  }

 private:
  Test::TempFolder folder_;
  Knob::Configuration configuration_;
};

}  // namespace

KernelUnderTest &kernelUnderTest() {
  static EmulatedUnderTest kernel;
  return kernel;
}

}  // namespace Contract
