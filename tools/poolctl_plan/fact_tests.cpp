// SPDX-License-Identifier: Apache-2.0
// Each file of definitions is parsed once; only the values are computed anew for each machine.
#include "poolctl_plan/fact_tests.h"

#include <yaml-cpp/yaml.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <stdexcept>

#include "plan_check/definition_check.h"
#include "plan_check/machine.h"
#include "plan_check/set_check.h"

namespace Plan {
namespace {

namespace fs = std::filesystem;

constexpr const char *kHeadings =
    "name,auto,memMin,memMax,memMinLimit,memShares,cpuMin,cpuMax,cpuShares";

std::string readAll(const fs::path &path) {
  std::ifstream stream(path, std::ios::binary);
  if (!stream) throw std::runtime_error(path.string() + ": cannot be read");
  return std::string((std::istreambuf_iterator<char>(stream)), {});
}

std::vector<fs::path> factFiles(const std::string &folder) {
  std::error_code problem;
  std::vector<fs::path> files;
  for (fs::directory_iterator entry(folder, problem), end; !problem && entry != end;
       entry.increment(problem)) {
    if (entry->path().extension() == ".facts") files.push_back(entry->path());
  }
  if (problem) throw std::runtime_error(folder + ": " + problem.message());
  if (files.empty()) throw std::runtime_error(folder + ": has no files named *.facts");
  std::sort(files.begin(), files.end());
  return files;
}

std::string number(int64_t value) {
  return value == -1 ? "-" : std::to_string(value);
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
      return number(value);
  }
}

std::string tableLine(const Loader::ResourcePoolImpl &pool) {
  return pool.name + "," + (pool.isEnabled ? "yes" : "no") + "," + number(pool.mem.min) + "," +
         number(pool.mem.max) + "," + number(pool.mem.minLimit) + "," + shares(pool.mem.shares) +
         "," + number(pool.cpu.min) + "," + number(pool.cpu.max) + "," + shares(pool.cpu.shares);
}

std::vector<std::string> linesOf(const std::string &text) {
  std::vector<std::string> lines;
  for (size_t at = 0; at < text.size();) {
    const size_t end = std::min(text.find('\n', at), text.size());
    lines.push_back(text.substr(at, end - at));
    at = end + 1;
  }
  return lines;
}

// One machine after the other, on definitions that the loader can read.
class Runner {
 public:
  explicit Runner(const std::vector<std::string> &files) {
    const Machine machine = unknownMachine();
    for (const std::string &path : files) {
      const CheckedFile checked = checkFile(path, path, machine.facts);
      for (const Finding &finding : checked.findings) {
        if (finding.severity == Severity::kError && !finding.isAtLoad) {
          throw std::runtime_error(path + ": has errors; poolctl-plan check reports them");
        }
      }
      const YAML::Node document = YAML::Load(checked.source->text());
      size_t i = 0;
      for (const auto &item : document) {
        items_.push_back(item);
        pools_.push_back(checked.pools[i++]);
      }
    }
  }

  FactTest run(const fs::path &facts, Tables tables) {
    const Machine machine = readMachine(facts.string());
    for (size_t i = 0; i < items_.size(); ++i) {
      pools_[i].pool = std::make_shared<Loader::ResourcePoolImpl>(items_[i], machine.facts);
    }
    FactTest test;
    test.name = facts.stem().string();
    const std::vector<KernelGroup> none;
    for (const Finding &finding : checkSet(pools_, machine, none)) {
      if (finding.severity != Severity::kError) continue;
      test.problems.push_back(finding.pool + ": " + finding.message);
    }
    compareTable(facts, tables, &test);
    return test;
  }

 private:
  void compareTable(const fs::path &facts, Tables tables, FactTest *test) const {
    const fs::path path = fs::path(facts).replace_extension(".csv");
    std::vector<std::string> actual = {kHeadings};
    for (const DeclaredPool *const pool : inLoadOrder(pools_)) {
      actual.push_back(tableLine(*pool->pool));
    }
    if (tables == Tables::kWrite) {
      write(path, actual);
    } else if (fs::exists(path)) {
      const std::vector<std::string> expected = linesOf(readAll(path));
      addMissing(expected, actual, '-', test);
      addMissing(actual, expected, '+', test);
    }
  }

  static void addMissing(const std::vector<std::string> &from, const std::vector<std::string> &in,
                         char sign, FactTest *test) {
    for (const std::string &line : from) {
      if (std::find(in.begin(), in.end(), line) == in.end()) test->changes.push_back(sign + line);
    }
  }

  static void write(const fs::path &path, const std::vector<std::string> &lines) {
    std::ofstream stream(path, std::ios::binary | std::ios::trunc);
    for (const std::string &line : lines) stream << line << '\n';
    stream.close();
    if (!stream) throw std::runtime_error(path.string() + ": cannot be written");
  }

  std::vector<YAML::Node> items_;
  std::vector<DeclaredPool> pools_;
};

}  // namespace

std::vector<FactTest> runFactTests(const std::string &folder, const std::vector<std::string> &files,
                                   Tables tables) {
  const std::vector<fs::path> machines = factFiles(folder);
  Runner runner(files);
  std::vector<FactTest> tests;
  for (const fs::path &facts : machines) tests.push_back(runner.run(facts, tables));
  return tests;
}

}  // namespace Plan
