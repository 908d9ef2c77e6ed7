// SPDX-License-Identifier: Apache-2.0
// Each sub-command reads its options, lets the check or the plan do its work, and prints the
// result.
#include "poolctl_plan/commands.h"

#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <algorithm>
#include <array>
#include <chrono>
#include <iostream>
#include <nlohmann/json.hpp>
#include <string>

#include "knob/session.h"
#include "plan_check/comparison.h"
#include "plan_check/report.h"
#include "plan_check/set_check.h"
#include "platform/knob.h"
#include "poolctl_plan/execution.h"
#include "poolctl_plan/explanation.h"
#include "poolctl_plan/fact_tests.h"
#include "poolctl_plan/files.h"
#include "poolctl_plan/steps.h"
#include "shared/command_table.h"
#include "shared/text.h"

namespace Plan {
namespace {

using Tools::ExitStatus;
using Json = nlohmann::ordered_json;

// A day. Longer than anyone waits, and far below where the clock's arithmetic ends.
constexpr int kMaxWaitSeconds = 86400;

struct Options {
  Input input;
  bool strict = false;
  bool json = false;
  bool dryRun = false;
  bool prune = false;
  int waitSeconds = 0;
  std::string pool, key;
  std::string folder;
  bool update = false;
};

void printNotes(const std::vector<std::string> &notes) {
  for (const std::string &note : notes) {
    std::cerr << "poolctl-plan: note: " << Tools::printable(note) << '\n';
  }
}

std::string counted(size_t number, const char *what) {
  return std::to_string(number) + " " + what + (number == 1 ? "" : "s");
}

void printFindings(const Checked &checked) {
  for (const Finding &finding : checked.findings) {
    std::cout << findingText(finding, checked.sources) << '\n';
  }
  if (checked.findings.empty()) return;
  std::cout << counted(count(checked.findings, Severity::kError), "error") << ", "
            << counted(count(checked.findings, Severity::kWarning), "warning") << " in "
            << counted(checked.sources.size(), "file") << '\n';
}

ExitStatus foundIf(bool found) {
  return found ? Tools::kExitFailure : Tools::kExitSuccess;
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
    printFindings(checked);
  }
  return foundIf(count(checked.findings, Severity::kError) > 0);
}

[[noreturn]] void failWithoutKernel(const Surroundings &surroundings) {
  throw Tools::Failure(Tools::kExitFailure,
                       surroundings.notes.front() + " (`knobctl status` reports more)");
}

// This machine with its kernel, which is needed.
Surroundings kernelSurroundings() {
  Surroundings surroundings = thisSurroundings();
  if (!surroundings.groups) failWithoutKernel(surroundings);
  return surroundings;
}

ExitStatus facts(const Options &options) {
  const Machine machine = kernelSurroundings().machine;
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

// Definitions that poolctl can read. Throws Failure when there are others, which it has printed.
Checked readable(const Options &options, const Surroundings &surroundings) {
  Checked checked = checkInput(options.input, surroundings);
  const auto end =
      std::remove_if(checked.findings.begin(), checked.findings.end(), [](const Finding &finding) {
        return finding.severity != Severity::kError || finding.isAtLoad;
      });
  checked.findings.erase(end, checked.findings.end());
  if (checked.findings.empty()) return checked;
  for (const Finding &finding : checked.findings) {
    std::cerr << findingText(finding, checked.sources);
  }
  throw Tools::Failure(Tools::kExitFailure, "the definitions cannot be read");
}

ExitStatus diff(const Options &options) {
  const Surroundings surroundings = kernelSurroundings();
  const Checked checked = readable(options, surroundings);
  const bool whole = options.input.files.empty();
  const auto differences = compare(checked.pools, *surroundings.groups,
                                   whole ? Undeclared::kReport : Undeclared::kLeaveOut);
  std::cout << (options.json ? differenceJson(differences) : differenceTable(differences));
  return foundIf(!differences.empty());
}

// What load would refuse, but for what only the groups of now stand in the way of.
void refuseWrongSet(const std::vector<DeclaredPool> &pools, const Surroundings &surroundings,
                    const Sources &sources) {
  size_t errors = 0;
  for (const Finding &finding :
       checkSetAfterStart(pools, surroundings.machine, *surroundings.groups)) {
    if (finding.severity != Severity::kError) continue;
    std::cerr << findingText(finding, sources);
    ++errors;
  }
  if (errors == 0) return;
  throw Tools::Failure(Tools::kExitFailure, "the definitions cannot be loaded; nothing is changed");
}

void requireMatchingKernel() {
  char runningBuild[21] = {};
  const char *ownBuild = "";
  if (KNOB_CheckSig(runningBuild, sizeof runningBuild, &ownBuild) == 0) return;
  throw Tools::Failure(Tools::kExitFailure,
                       "the kernel's groups were made with another interface (`knobctl status` "
                       "reports more); nothing is changed");
}

Json stepJson(const Step &step) {
  const char *const act = step.act == Step::Act::kDelete   ? "delete"
                          : step.act == Step::Act::kCreate ? "create"
                                                           : "set";
  Json settings = Json::array();
  for (const Setting &setting : step.settings) {
    settings.push_back({{"key", setting.key}, {"from", setting.kernel}, {"to", setting.declared}});
  }
  return {{"act", act}, {"pool", step.path}, {"settings", settings}};
}

void printPlan(const StepList &plan) {
  for (const Step &step : plan.steps) std::cout << Tools::printable(stepText(step)) << '\n';
  for (const Obstacle &obstacle : plan.obstacles) {
    std::cout << "cannot change " << Tools::printable(obstacle.path) << ": "
              << Tools::printable(obstacle.reason) << '\n';
  }
  std::cout << std::flush;
}

std::string applyJson(const StepList &plan, const std::vector<Outcome> &outcomes) {
  Json steps = Json::array();
  for (size_t i = 0; i < plan.steps.size(); ++i) {
    Json step = stepJson(plan.steps[i]);
    const bool tried = i < outcomes.size();
    step["result"] = !tried ? "planned" : outcomes[i].isDone ? "done" : "failed";
    step["reason"] = tried ? outcomes[i].reason : "";
    steps.push_back(std::move(step));
  }
  Json obstacles = Json::array();
  for (const Obstacle &obstacle : plan.obstacles) {
    obstacles.push_back({{"pool", obstacle.path}, {"reason", obstacle.reason}});
  }
  return Json({{"steps", steps}, {"obstacles", obstacles}})
             .dump(2, ' ', false, Json::error_handler_t::replace) +
         "\n";
}

ExitStatus apply(const Options &options) {
  const Surroundings surroundings = kernelSurroundings();
  requireMatchingKernel();
  const Checked checked = readable(options, surroundings);
  refuseWrongSet(checked.pools, surroundings, checked.sources);
  const StepList plan = planSteps(checked.pools, surroundings.machine, *surroundings.groups,
                                  options.prune ? Prune::kEmptyGroups : Prune::kNo);
  if (!options.json) printPlan(plan);
  std::vector<Outcome> outcomes;
  if (!options.dryRun && !plan.steps.empty()) {
    const auto kernel = Knob::openConfiguredKernel();
    const auto report = [&options](const Outcome &outcome) {
      if (options.json || outcome.isDone) return;
      std::cerr << "poolctl-plan: not done: " << Tools::printable(stepText(outcome.step)) << ": "
                << Tools::printable(outcome.reason) << '\n';
    };
    outcomes = execute(plan.steps, *kernel, std::chrono::seconds(options.waitSeconds), report);
  }
  const auto done = static_cast<size_t>(std::count_if(
      outcomes.begin(), outcomes.end(), [](const Outcome &outcome) { return outcome.isDone; }));
  if (options.json) {
    std::cout << applyJson(plan, outcomes);
  } else if (!options.dryRun && !plan.steps.empty()) {
    std::cout << done << " of " << counted(plan.steps.size(), "step") << " done\n";
  }
  return foundIf(done < plan.steps.size() || !plan.obstacles.empty());
}

std::string fullPath(const std::string &name) {
  return name.compare(0, 5, "host/") == 0 ? name : "host/opt/" + name;
}

ExitStatus explainPools(const Options &options) {
  const Surroundings surroundings = surroundingsOf(options.input);
  if (!surroundings.machine.isKnown) failWithoutKernel(surroundings);
  const Checked checked = readable(options, surroundings);
  const std::string source =
      options.input.factsPath.empty() ? "this kernel" : options.input.factsPath;
  std::vector<Explanation> explanations;
  bool found = options.pool.empty();
  for (const DeclaredPool *const pool : inLoadOrder(checked.pools)) {
    const std::string &path = pool->pool->name;
    if (!options.pool.empty() && path != fullPath(options.pool)) continue;
    found = true;
    const auto own = explain(*pool, options.key, surroundings.machine, source);
    explanations.insert(explanations.end(), own.begin(), own.end());
  }
  if (!found) {
    throw Tools::Failure(Tools::kExitFailure,
                         Tools::printable(fullPath(options.pool)) + ": not declared");
  }
  if (explanations.empty() && !options.key.empty()) {
    throw Tools::Failure(Tools::kExitFailure,
                         Tools::printable(options.key) + ": not a key that has a value");
  }
  std::cout << (options.json ? explanationJson(explanations) : explanationText(explanations));
  return Tools::kExitSuccess;
}

void printTest(const FactTest &test) {
  if (!test.problems.empty()) std::cout << test.name << ": the set does not fit\n";
  for (const std::string &problem : test.problems) {
    std::cout << "  " << Tools::printable(problem) << '\n';
  }
  if (!test.changes.empty()) std::cout << test.name << ": the table differs\n";
  for (const std::string &line : test.changes) std::cout << "  " << Tools::printable(line) << '\n';
}

Json testJson(const FactTest &test) {
  return {{"name", test.name}, {"problems", test.problems}, {"changes", test.changes}};
}

ExitStatus testFacts(const Options &options) {
  const auto tests = runFactTests(options.folder, pathsOf(options.input),
                                  options.update ? Tables::kWrite : Tables::kCompare);
  Json list = Json::array();
  size_t unfit = 0;
  size_t different = 0;
  for (const FactTest &test : tests) {
    if (!options.json) printTest(test);
    list.push_back(testJson(test));
    unfit += test.problems.empty() ? 0 : 1;
    different += test.changes.empty() ? 0 : 1;
  }
  if (options.json) {
    std::cout << Json({{"tests", list}}).dump(2, ' ', false, Json::error_handler_t::replace)
              << '\n';
  } else {
    std::cout << counted(tests.size(), "machine") << ": the set does not fit on " << unfit
              << ", the table differs on " << different << '\n';
  }
  return foundIf(unfit + different > 0);
}

void addJson(CLI::App &command, Options *options) {
  command.add_flag("--json", options->json, "Print one JSON document");
}

CLI::Option *addFiles(CLI::App &command, Options *options) {
  addJson(command, options);
  return command.add_option("FILE", options->input.files,
                            "Definition files; without any, those of /etc/rp.d");
}

void addFacts(CLI::App &command, Options *options) {
  command
      .add_option("--facts", options->input.factsPath,
                  "Evaluate for the machine of this file; ask no kernel")
      ->type_name("FILE");
}

void checkOptions(CLI::App &command, Options *options) {
  addFiles(command, options);
  addFacts(command, options);
  command.add_flag("--strict", options->strict, "Count warnings as errors");
}

void diffOptions(CLI::App &command, Options *options) {
  addFiles(command, options);
}

void applyOptions(CLI::App &command, Options *options) {
  CLI::Option *const files = addFiles(command, options);
  command.add_flag("--dry-run", options->dryRun, "Print the plan and change nothing");
  command.add_flag("--prune", options->prune, "Delete empty groups that no definition declares")
      ->excludes(files);
  command.add_option("-w", options->waitSeconds, "Wait this long for what is busy")
      ->type_name("SECONDS")
      ->check(CLI::Range(0, kMaxWaitSeconds));
}

void explainOptions(CLI::App &command, Options *options) {
  command.add_option("POOL", options->pool, "Only this pool");
  command.add_option("KEY", options->key, "Only this key");
  command.add_option("--file", options->input.files, "A definition file, instead of /etc/rp.d")
      ->allow_extra_args(false)
      ->type_name("FILE");
  addFacts(command, options);
  addJson(command, options);
}

void testOptions(CLI::App &command, Options *options) {
  command.add_option("DIR", options->folder, "Folder with NAME.facts and NAME.csv")->required();
  addFiles(command, options);
  command.add_flag("--update", options->update, "Write each NAME.csv instead of comparing it");
}

constexpr std::array kCommands = {
    Tools::Command<Options>{"check", "Reports every mistake in definition files", checkOptions,
                            check},
    Tools::Command<Options>{"explain", "Shows where values come from", explainOptions,
                            explainPools},
    Tools::Command<Options>{"diff", "Compares definitions with the kernel's groups", diffOptions,
                            diff},
    Tools::Command<Options>{"apply", "Makes the kernel's groups match the definitions",
                            applyOptions, apply},
    Tools::Command<Options>{"facts", "Writes this machine's facts, for --facts", addJson, facts},
    Tools::Command<Options>{"test", "Evaluates definitions for many machines", testOptions,
                            testFacts},
};

}  // namespace

void addCommands(CLI::App &app, Tools::Action *action) {
  Tools::addCommands(app, kCommands, action);
  app.footer("Exit status: 0 nothing to report; 1 found something, or failed; 2 wrong usage.\n");
}

}  // namespace Plan
