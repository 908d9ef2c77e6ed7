// SPDX-License-Identifier: Apache-2.0
// Thin: a sub-command reads its words, makes one call of the kernel and prints the answer. What the
// kernel allows is the kernel's business.
#include "knobctl/commands.h"

#include <unistd.h>

#include <array>
#include <cstdlib>
#include <iostream>
#include <string>
#include <string_view>

#include "knobctl/kernel_access.h"
#include "knobctl/kernel_report.h"
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

struct Words {
  std::string path = "host";
  int64_t pid = 0;
  bool repair = false;
  BootWords boot;
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

ExitStatus boot(const Words &words) {
  bootKernel(words.boot);
  return Tools::kExitSuccess;
}

ExitStatus status(const Words &) {
  const KernelReport report = reportOnKernel();
  for (const auto &[label, text] : report.lines) printLine(label, text);
  if (!report.problem.empty()) throw Tools::Failure(Tools::kExitFailure, report.problem);
  return Tools::kExitSuccess;
}

ExitStatus tree(const Words &words) {
  onKernel("tree " + words.path, [&](Kernel &kernel) {
    std::cout << layOutTree(collectTree(kernel, words.path), kernel.facts(), look());
  });
  return Tools::kExitSuccess;
}

std::string shares(int64_t value) {
  switch (value) {
    case -2:
      return "low";
    case -3:
      return "normal";
    case -4:
      return "high";
    default:
      return std::to_string(value);
  }
}

std::string limit(int64_t value) {
  return value < 0 ? "none" : std::to_string(value);
}

void printAllocation(const std::string &name, const std::string &unit,
                     const Knob::Allocation &allocation, int64_t reservation) {
  printLine(name + " min " + unit, allocation.min);
  printLine(name + " max " + unit, limit(allocation.max));
  printLine(name + " minLimit " + unit, limit(allocation.minLimit));
  printLine(name + " shares", shares(allocation.shares));
  printLine(name + " reservation " + unit, reservation);
}

void printUsage(const Knob::GroupUsage &usage) {
  if (usage.memoryBytes) printLine("memory used bytes", std::to_string(*usage.memoryBytes));
  if (usage.cpuMicroseconds) printLine("CPU used us", std::to_string(*usage.cpuMicroseconds));
}

ExitStatus stats(const Words &words) {
  onKernel("stats " + words.path, [&](Kernel &kernel) {
    const GroupId id = kernel.lookUp(words.path);
    const Knob::GroupView view = kernel.view(id);
    const Knob::MemoryStatistics peaks = kernel.memoryStatistics(id);
    printLine("group", words.path);
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

ExitStatus facts(const Words &) {
  const Knob::HostFacts facts = onKernel("facts", [](Kernel &kernel) { return kernel.facts(); });
  printLine("CPUs", int64_t{facts.cpus});
  printLine("memory KB", std::to_string(facts.memoryKB));
  printLine("virtual machines at most", int64_t{facts.maxVms});
  printLine("is a virtual machine", facts.isVm ? "yes" : "no");
  printLine("boot command line", facts.bootCommandLine);
  return Tools::kExitSuccess;
}

// What was found and repaired is no failure; what is left is.
ExitStatus check(const Words &words) {
  const auto findings =
      onKernel("check", [&](Kernel &kernel) { return kernel.check(words.repair); });
  ExitStatus result = Tools::kExitSuccess;
  for (const Knob::Finding &finding : findings) {
    std::cout << printable(finding.path) << ": " << printable(finding.text)
              << (finding.repaired ? " (repaired)" : "") << '\n';
    if (!finding.repaired) result = Tools::kExitFailure;
  }
  if (findings.empty()) std::cout << "nothing is wrong\n";
  return result;
}

ExitStatus create(const Words &words) {
  onKernel("create " + words.path, [&](Kernel &kernel) {
    const size_t slash = words.path.rfind('/');
    if (slash == std::string::npos) {
      throw Knob::KernelError(Knob::Status::kBadParameter, "a path begins with host/");
    }
    (void)kernel.create(kernel.lookUp(words.path.substr(0, slash)), words.path.substr(slash + 1));
  });
  return Tools::kExitSuccess;
}

ExitStatus remove(const Words &words) {
  onKernel("delete " + words.path,
           [&](Kernel &kernel) { kernel.remove(kernel.lookUp(words.path)); });
  return Tools::kExitSuccess;
}

ExitStatus join(const Words &words) {
  onKernel("join " + words.path + " " + std::to_string(words.pid),
           [&](Kernel &kernel) { kernel.join(kernel.lookUp(words.path), words.pid); });
  return Tools::kExitSuccess;
}

void noWords(CLI::App &, Words *) {}

void bootWords(CLI::App &command, Words *words) {
  declareBootWords(command, &words->boot);
}

void pathWord(CLI::App &command, Words *words) {
  command.add_option("PATH", words->path, "Path of the group, such as host/opt/backup")->required();
}

void treeWords(CLI::App &command, Words *words) {
  command.add_option("PATH", words->path, "Only this group and what is below it");
}

void checkWords(CLI::App &command, Words *words) {
  command.add_flag("--repair", words->repair, "Mend what is wrong");
}

// The parser alone would take the largest number for one that is larger still.
bool isProcessNumber(const std::string &text) {
  constexpr size_t kMaxDigits = 18;
  return text.size() <= kMaxDigits && text.find_first_not_of("0123456789") == std::string::npos &&
         text.find_first_not_of('0') != std::string::npos;
}

void joinWords(CLI::App &command, Words *words) {
  pathWord(command, words);
  command.add_option("PID", words->pid, "Number of the process")
      ->required()
      ->check([](const std::string &text) {
        return isProcessNumber(text) ? "" : "\"" + printable(text) + "\" is no process's number";
      });
}

constexpr std::array<Tools::Command<Words>, 9> kCommands = {{
    {"boot", "Starts the emulated kernel anew, without groups", bootWords, boot},
    {"status", "Tells which kernel this is and whether it can be used", noWords, status},
    {"tree", "Prints the groups with their memory and CPU", treeWords, tree},
    {"stats", "Prints all that is known of one group", pathWord, stats},
    {"facts", "Prints what the kernel knows of the machine", noWords, facts},
    {"check", "Recounts what the kernel keeps", checkWords, check},
    {"create", "Makes a group", pathWord, create},
    {"delete", "Deletes a group", pathWord, remove},
    {"join", "Puts a process in a group", joinWords, join},
}};

}  // namespace

void addCommands(CLI::App &app, Tools::Action *action) {
  Tools::addCommands(app, kCommands, action);
}

}  // namespace Knobctl
