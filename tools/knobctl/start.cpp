// SPDX-License-Identifier: Apache-2.0
// The options of `knobctl boot`, and the facts that they set.
#include "knobctl/start.h"

#include "knob/emulated/boot.h"
#include "knob/session.h"
#include "knobctl/kernel_access.h"

namespace Knobctl {

void declareBootOptions(CLI::App &command, BootOptions *options) {
  command.add_option("--cpus", options->cpus, "CPUs of the machine")->type_name("N");
  command.add_option("--memory", options->memoryMB, "Physical memory in MB")->type_name("MB");
  command.add_option("--max-vms", options->maxVms, "Virtual machines at most")->type_name("N");
  command.add_flag("--vm", options->vm, "The machine is a virtual machine");
  command.add_option("--cmdline", options->commandLine, "Boot command line")
      ->type_name("TEXT")
      ->each([options](const std::string &) { options->hasCommandLine = true; });
  command.add_flag("--force", options->force, "Even when the running kernel has groups");
}

void bootKernel(const BootOptions &options) {
  reporting("boot", [&] {
    const Knob::Configuration configuration = Knob::sessionConfiguration();
    if (configuration.kernel != Knob::Configuration::KernelKind::kEmulated) {
      throw Knob::KernelError(Knob::Status::kNotSupported,
                              "the configured kernel is the running system's own");
    }
    Knob::BootFacts facts;
    facts.cpus = options.cpus;
    facts.memoryMB = options.memoryMB;
    facts.maxVms = options.maxVms;
    if (options.vm) facts.isVm = true;
    if (options.hasCommandLine) facts.commandLine = options.commandLine;
    Knob::bootEmulatedKernel(configuration, facts, options.force);
  });
}

}  // namespace Knobctl
