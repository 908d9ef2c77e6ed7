// SPDX-License-Identifier: Apache-2.0
// Each sub-command reads its options, lets the check or the plan do its work, and prints the
// result.
#include "poolctl_plan/commands.h"

#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <array>
#include <iostream>
#include <nlohmann/json.hpp>
#include <string>

#include "plan_check/report.h"
#include "poolctl_plan/files.h"
#include "shared/command_table.h"
#include "shared/text.h"

namespace Plan {
namespace {

using Tools::ExitStatus;
using Json = nlohmann::ordered_json;

struct Options {
  Input input;
  bool strict = false;
  bool json = false;
};

void printNotes(const std::vector<std::string> &notes) {
  for (const std::string &note : notes) {
    std::cerr << "poolctl-plan: note: " << Tools::printable(note) << '\n';
  }
}

std::string counted(size_t number, const char *what) {
  return std::to_string(number) + " " + what + (number == 1 ? "" : "s");
}

void printSummary(const Findings &findings, size_t files) {
  std::cout << counted(count(findings, Severity::kError), "error") << ", "
            << counted(count(findings, Severity::kWarning), "warning") << " in "
            << counted(files, "file") << '\n';
}

ExitStatus check(const Options &options) {
  const Surroundings surroundings = surroundingsOf(options.input);
  Checked checked = checkInput(options.input, surroundings);
  if (options.strict) {
    for (Finding &finding : checked.findings) finding.severity = Severity::kError;
  }
  if (options.json) {
    std::cout << findingsJson(checked.findings, checked.sources, surroundings.notes);
  } else {
    printNotes(surroundings.notes);
    for (const Finding &finding : checked.findings) {
      std::cout << findingText(finding, checked.sources) << '\n';
    }
    if (!checked.findings.empty()) printSummary(checked.findings, checked.sources.size());
  }
  return count(checked.findings, Severity::kError) == 0 ? Tools::kExitSuccess : Tools::kExitFailure;
}

ExitStatus facts(const Options &options) {
  const Surroundings surroundings = thisSurroundings();
  if (!surroundings.notes.empty()) {
    throw Tools::Failure(Tools::kExitFailure,
                         surroundings.notes.front() + " (`knobctl status` reports more)");
  }
  const Machine &machine = surroundings.machine;
  if (!options.json) {
    std::cout << machineText(machine);
    return Tools::kExitSuccess;
  }
  Json document = Json::object();
  for (const char *const name : {"numPCPUs", "physKB", "maxVMs", "isVm", "isInstaller"}) {
    document[name] = static_cast<uint64_t>(machine.facts.at(name));
  }
  document["memoryCapacityMB"] = machine.memoryMB;
  document["cpuCapacityPercent"] = machine.cpuPercent;
  std::cout << document.dump(2) << '\n';
  return Tools::kExitSuccess;
}

void addJson(CLI::App &command, Options *options) {
  command.add_flag("--json", options->json, "Print one JSON document");
}

void addInput(CLI::App &command, Options *options) {
  command.add_option("FILE", options->input.files,
                     "Definition files; without any, those of /etc/rp.d");
  command
      .add_option("--facts", options->input.factsPath,
                  "Evaluate for the machine of this file; ask no kernel")
      ->type_name("FILE");
  addJson(command, options);
}

void checkOptions(CLI::App &command, Options *options) {
  addInput(command, options);
  command.add_flag("--strict", options->strict, "Count warnings as errors");
}

constexpr std::array kCommands = {
    Tools::Command<Options>{"check", "Reports every mistake in definition files", checkOptions,
                            check},
    Tools::Command<Options>{"facts", "Writes this machine's facts, for --facts", addJson, facts},
};

}  // namespace

void addCommands(CLI::App &app, Tools::Action *action) {
  Tools::addCommands(app, kCommands, action);
  app.footer("Exit status: 0 nothing to report; 1 found something, or failed; 2 wrong usage.\n");
}

}  // namespace Plan
