// SPDX-License-Identifier: Apache-2.0
// Thin: a sub-command reads its options, makes one call of the kernel and prints the result. The
// kernel decides what is allowed.
#include "knobctl/commands.h"

#include <unistd.h>

#include <array>
#include <cstdlib>
#include <iostream>
#include <string>
#include <string_view>

#include "knobctl/kernel_access.h"
#include "knobctl/kernel_report.h"
#include "knobctl/set.h"
#include "knobctl/start.h"
#include "knobctl/tree.h"
#include "shared/command_table.h"
#include "shared/text.h"

namespace Knobctl {

namespace {

using Knob::GroupId;
using Knob::Kernel;
using Tools::ExitStatus;
using Tools::printable;

constexpr size_t kLabelColumns = 26;

struct Options {
  std::string path = "host";
  int64_t pid = 0;
  bool repair = false;
  BootOptions boot;
  SetOptions set;
};

void printLine(const std::string &label, const std::string &text) {
  std::cout << Tools::padded(label, kLabelColumns) << printable(text) << '\n';
}

void printLine(const std::string &label, int64_t number) {
  printLine(label, std::to_string(number));
}

Look look() {
  const char *terminal = std::getenv("TERM");
  const bool dumb = terminal == nullptr || std::string_view(terminal) == "dumb";
  const bool colour = isatty(STDOUT_FILENO) == 1 && !dumb && std::getenv("NO_COLOR") == nullptr;
  return colour ? Look::kColour : Look::kPlain;
}

ExitStatus boot(const Options &options) {
  bootKernel(options.boot);
  return Tools::kExitSuccess;
}

ExitStatus status(const Options &) {
  const KernelReport report = reportOnKernel();
  for (const auto &[label, text] : report.lines) printLine(label, text);
  if (!report.problem.empty()) throw Tools::Failure(Tools::kExitFailure, report.problem);
  return Tools::kExitSuccess;
}

ExitStatus tree(const Options &options) {
  onKernel("tree " + options.path, [&](Kernel &kernel) {
    std::cout << layOutTree(collectTree(kernel, options.path), kernel.facts(), look());
  });
  return Tools::kExitSuccess;
}

std::string limit(int64_t value) {
  return value < 0 ? "none" : std::to_string(value);
}

void printAllocation(const std::string &name, const std::string &unit,
                     const Knob::Allocation &allocation, int64_t reservation) {
  printLine(name + " min " + unit, allocation.min);
  printLine(name + " max " + unit, limit(allocation.max));
  printLine(name + " minLimit " + unit, limit(allocation.minLimit));
  printLine(name + " shares", sharesText(allocation.shares));
  printLine(name + " reservation " + unit, reservation);
}

void printUsage(const Knob::GroupUsage &usage) {
  if (usage.memoryBytes) printLine("memory used bytes", std::to_string(*usage.memoryBytes));
  if (usage.cpuMicroseconds) printLine("CPU used us", std::to_string(*usage.cpuMicroseconds));
}

ExitStatus stats(const Options &options) {
  onKernel("stats " + options.path, [&](Kernel &kernel) {
    const GroupId id = kernel.lookUp(options.path);
    const Knob::GroupView view = kernel.view(id);
    const Knob::MemoryStatistics peaks = kernel.memoryStatistics(id);
    printLine("group", options.path);
    printLine("id", id);
    printAllocation("memory", "MB", view.memory, view.memoryReservationMB);
    printLine("memory own peak KB", std::to_string(peaks.ownReservedPeakKB));
    printLine("memory children peak KB", std::to_string(peaks.childrenReservedPeakKB));
    printAllocation("CPU", "%", view.cpu, view.cpuReservationPercent);
    printUsage(view.usage);
    for (const int64_t pid : kernel.members(id)) printLine("process", pid);
  });
  return Tools::kExitSuccess;
}

ExitStatus facts(const Options &) {
  const Knob::HostFacts facts = onKernel("facts", [](Kernel &kernel) { return kernel.facts(); });
  printLine("CPUs", int64_t{facts.cpus});
  printLine("memory KB", std::to_string(facts.memoryKB));
  printLine("virtual machines at most", int64_t{facts.maxVms});
  printLine("is a virtual machine", facts.isVm ? "yes" : "no");
  printLine("boot command line", facts.bootCommandLine);
  return Tools::kExitSuccess;
}

// A finding that was repaired is not a failure.
ExitStatus check(const Options &options) {
  const auto findings =
      onKernel("check", [&](Kernel &kernel) { return kernel.check(options.repair); });
  ExitStatus result = Tools::kExitSuccess;
  for (const Knob::Finding &finding : findings) {
    std::cout << printable(finding.path) << ": " << printable(finding.text)
              << (finding.repaired ? " (repaired)" : "") << '\n';
    if (!finding.repaired) result = Tools::kExitFailure;
  }
  if (findings.empty()) std::cout << "nothing is wrong\n";
  return result;
}

ExitStatus create(const Options &options) {
  onKernel("create " + options.path, [&](Kernel &kernel) {
    const size_t slash = options.path.rfind('/');
    if (slash == std::string::npos) {
      throw Knob::KernelError(Knob::Status::kBadParameter, "a path begins with host/");
    }
    (void)kernel.create(kernel.lookUp(options.path.substr(0, slash)),
                        options.path.substr(slash + 1));
  });
  return Tools::kExitSuccess;
}

ExitStatus set(const Options &options) {
  setAllocations(options.path, options.set);
  return Tools::kExitSuccess;
}

ExitStatus remove(const Options &options) {
  onKernel("delete " + options.path,
           [&](Kernel &kernel) { kernel.remove(kernel.lookUp(options.path)); });
  return Tools::kExitSuccess;
}

ExitStatus join(const Options &options) {
  onKernel("join " + options.path + " " + std::to_string(options.pid),
           [&](Kernel &kernel) { kernel.join(kernel.lookUp(options.path), options.pid); });
  return Tools::kExitSuccess;
}

void noOptions(CLI::App &, Options *) {}

void bootOptions(CLI::App &command, Options *options) {
  declareBootOptions(command, &options->boot);
}

void pathOption(CLI::App &command, Options *options) {
  command.add_option("PATH", options->path, "Path of the group, such as host/opt/backup")
      ->required();
}

void setOptions(CLI::App &command, Options *options) {
  pathOption(command, options);
  declareSetOptions(command, &options->set);
}

void treeOptions(CLI::App &command, Options *options) {
  command.add_option("PATH", options->path, "Only this group and what is below it");
}

void checkOptions(CLI::App &command, Options *options) {
  command.add_flag("--repair", options->repair, "Repair what is wrong");
}

// The parser alone would take the largest number for one that is larger still.
bool isProcessNumber(const std::string &text) {
  constexpr size_t kMaxDigits = 18;
  return text.size() <= kMaxDigits && text.find_first_not_of("0123456789") == std::string::npos &&
         text.find_first_not_of('0') != std::string::npos;
}

void joinOptions(CLI::App &command, Options *options) {
  pathOption(command, options);
  command.add_option("PID", options->pid, "Number of the process")
      ->required()
      ->check([](const std::string &text) {
        return isProcessNumber(text) ? ""
                                     : "\"" + printable(text) + "\" is not the number of a process";
      });
}

constexpr std::array<Tools::Command<Options>, 10> kCommands = {{
    {"boot", "Restarts the emulated kernel without groups", bootOptions, boot},
    {"status", "Prints which kernel is configured and whether it can be used", noOptions, status},
    {"tree", "Prints the groups with their memory and CPU", treeOptions, tree},
    {"stats", "Prints everything about one group", pathOption, stats},
    {"facts", "Prints the facts of the machine", noOptions, facts},
    {"check", "Checks the reservations that the kernel keeps", checkOptions, check},
    {"create", "Makes a group", pathOption, create},
    {"set", "Sets memory and CPU of a group", setOptions, set},
    {"delete", "Deletes a group", pathOption, remove},
    {"join", "Moves a process into a group", joinOptions, join},
}};

}  // namespace

void addCommands(CLI::App &app, Tools::Action *action) {
  Tools::addCommands(app, kCommands, action);
}

}  // namespace Knobctl
