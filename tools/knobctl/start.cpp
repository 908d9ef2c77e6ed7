// SPDX-License-Identifier: Apache-2.0
// The words of `knobctl boot` and the facts that they stand for.
#include "knobctl/start.h"

#include "knob/emulated/boot.h"
#include "knob/session.h"
#include "knobctl/kernel_access.h"

namespace Knobctl {

void declareBootWords(CLI::App &command, BootWords *words) {
  command.add_option("--cpus", words->cpus, "CPUs of the machine")->type_name("N");
  command.add_option("--memory", words->memoryMB, "Physical memory in MB")->type_name("MB");
  command.add_option("--max-vms", words->maxVms, "Virtual machines at most")->type_name("N");
  command.add_flag("--vm", words->vm, "The machine is itself a virtual one");
  command.add_option("--cmdline", words->commandLine, "Boot command line")
      ->type_name("TEXT")
      ->each([words](const std::string &) { words->hasCommandLine = true; });
  command.add_flag("--force", words->force, "Also when the running kernel has groups");
}

void bootKernel(const BootWords &words) {
  withWords("boot", [&] {
    const Knob::Configuration configuration = Knob::sessionConfiguration();
    if (configuration.kernel != Knob::Configuration::KernelKind::kEmulated) {
      throw Knob::KernelError(Knob::Status::kNotSupported,
                              "the configured kernel is the running system's own");
    }
    Knob::BootFacts facts;
    facts.cpus = words.cpus;
    facts.memoryMB = words.memoryMB;
    facts.maxVms = words.maxVms;
    if (words.vm) facts.isVm = true;
    if (words.hasCommandLine) facts.commandLine = words.commandLine;
    Knob::bootEmulatedKernel(configuration, facts, words.force);
  });
}

}  // namespace Knobctl
