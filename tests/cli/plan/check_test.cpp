// SPDX-License-Identifier: Apache-2.0
// poolctl-plan check and facts as their users run them. The folder "mistakes" holds definitions
// with one mistake each, and in the first line what the check must find; "correct" those in which
// it must find nothing.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "temp_folder.h"
#include "world.h"

namespace {

using nlohmann::json;
using ::Test::Arguments;
using ::Test::ProcessResult;
using ::Test::World;
using ::Test::writeFile;
using testing::HasSubstr;
using testing::Not;
namespace fs = std::filesystem;

const std::string kMachine = PLAN_CASES "/machine.facts";

std::vector<fs::path> filesOf(const std::string &folder) {
  std::vector<fs::path> files;
  for (const auto &entry : fs::directory_iterator(folder)) files.push_back(entry.path());
  std::sort(files.begin(), files.end());
  return files;
}

class PlanCheck : public testing::Test {
 protected:
  ProcessResult check(Arguments arguments) const {
    arguments.insert(arguments.begin(), "check");
    return world.run("poolctl-plan", arguments);
  }

  // The findings for a definition on the machine of the tests: "LINE:COLUMN SEVERITY CODE".
  std::vector<std::string> findings(const std::string &path) const {
    const ProcessResult result = check({"--json", "--facts", kMachine, path});
    EXPECT_EQ(result.err, "") << path;
    std::vector<std::string> found;
    const json document = json::parse(result.out);
    for (const json &finding : document.at("findings")) {
      found.push_back(std::to_string(finding.at("line").get<int>()) + ":" +
                      std::to_string(finding.at("column").get<int>()) + " " +
                      finding.at("severity").get<std::string>() + " " +
                      finding.at("code").get<std::string>());
    }
    return found;
  }

  std::string file(const std::string &yaml) {
    const fs::path path = world.folder() / "pools.yaml";
    writeFile(path, yaml);
    return path.string();
  }

  World world;
};

// From the first line: "# expect: FINDING; FINDING".
std::vector<std::string> expected(const fs::path &path) {
  const std::string first = ::Test::lines(::Test::readFile(path)).front();
  const std::string mark = "# expect: ";
  std::vector<std::string> list;
  for (size_t at = first.find(mark) + mark.size(); at < first.size();) {
    const size_t end = std::min(first.find("; ", at), first.size());
    list.push_back(first.substr(at, end - at));
    at = end + 2;
  }
  return list;
}

TEST_F(PlanCheck, EveryMistakeIsNamedAtItsPlace) {
  const std::vector<fs::path> files = filesOf(PLAN_CASES "/mistakes");
  EXPECT_GE(files.size(), 100U);
  for (const fs::path &path : files) {
    EXPECT_THAT(findings(path), testing::UnorderedElementsAreArray(expected(path))) << path;
  }
}

TEST_F(PlanCheck, NothingIsFoundInCorrectDefinitions) {
  std::vector<fs::path> files = filesOf(PLAN_CASES "/correct");
  EXPECT_GE(files.size(), 20U);
  for (const fs::path &path : filesOf(EXAMPLES)) files.push_back(path);
  for (const fs::path &path : files) {
    const ProcessResult result = check({"--strict", "--facts", kMachine, path.string()});
    EXPECT_EQ(result.out + result.err, "") << path;
    EXPECT_EQ(result.status, 0) << path;
  }
}

TEST_F(PlanCheck, ShowsTheSourceLineAndACaret) {
  const ProcessResult result =
      check({"--facts", kMachine, file("- name: web\n  memMax: !calc physMB / 4\n")});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.out, HasSubstr("pools.yaml:2:17: error: unknown variable \"physMB\" "
                                    "[unknown-variable]\n"
                                    "   2 |   memMax: !calc physMB / 4\n"
                                    "     |                 ^\n"
                                    "     = expected: one of isInstaller, "));
  EXPECT_THAT(result.out, HasSubstr("     = write physKB / 1024\n"));
  EXPECT_THAT(result.out, HasSubstr("1 error, 0 warnings in 1 file\n"));
}

TEST_F(PlanCheck, ReportsEveryMistakeOfAFile) {
  const ProcessResult result =
      check({"--facts", kMachine,
             file("- name: a\n  memMax: 1G\n  cpuMax: !calc foo + 1\n- name: b\n  mem_min: 3\n")});
  EXPECT_THAT(result.out, HasSubstr(":2:12: error"));
  EXPECT_THAT(result.out, HasSubstr(":3:17: error"));
  EXPECT_THAT(result.out, HasSubstr(":5:3: error"));
}

TEST_F(PlanCheck, ReportsMistakesBesideABrokenPool) {
  const ProcessResult result =
      check({"--facts", kMachine,
             file("- name: a\n  memMax: 1G\n- name: b\n\tmemMax: 5\n- name: c\n  cpu: 5\n")});
  EXPECT_THAT(result.out, HasSubstr(":2:12: error"));
  EXPECT_THAT(result.out, HasSubstr(":4:1: error: a tab cannot indent"));
  EXPECT_THAT(result.out, HasSubstr(":6:3: error"));
}

TEST_F(PlanCheck, WarningsAreErrorsWhenStrict) {
  const std::string path = file("- name: a\n  memMax: 2\n");
  EXPECT_EQ(check({"--facts", kMachine, path}).status, 0);
  EXPECT_EQ(check({"--strict", "--facts", kMachine, path}).status, 1);
}

TEST_F(PlanCheck, KnowsTheGroupsOfTheKernel) {
  EXPECT_EQ(world.run("knobctl", {"boot", "--cpus", "4", "--memory", "8192"}).status, 0);
  const std::string path = file("- name: a/b\n  memMax: 16\n");
  EXPECT_THAT(check({path}).out, HasSubstr("[no-parent]"));
  EXPECT_EQ(world.run("knobctl", {"create", "host/opt/a"}).status, 0);
  const ProcessResult result = check({path});
  EXPECT_EQ(result.out, "");
  EXPECT_EQ(result.status, 0);
}

TEST_F(PlanCheck, FitsTheMachineOfTheKernel) {
  EXPECT_EQ(world.run("knobctl", {"boot", "--cpus", "4", "--memory", "8192"}).status, 0);
  const ProcessResult result =
      check({file("- name: a\n  memMin: 8000\n- name: b\n  memMin: 200\n")});
  EXPECT_THAT(result.out, HasSubstr("asked: 200 MB; the machine has 8192 MB, of which 192 MB are "
                                    "free; held by host/opt/a (8000 MB)"));
}

TEST_F(PlanCheck, WithoutAKernelChecksWhatNeedsNone) {
  writeFile(world.folder() / "knob.conf", "kernel = none\n");
  const ProcessResult result = check({file("- name: a/b\n  memMin: !calc physKB\n  memMax: 5G\n")});
  EXPECT_THAT(result.err, HasSubstr("no usable kernel: "));
  EXPECT_THAT(result.err, HasSubstr("`knobctl status`"));
  EXPECT_THAT(result.err, HasSubstr("--facts"));
  EXPECT_THAT(result.out, HasSubstr(":3:12: error"));
  EXPECT_THAT(result.out, Not(HasSubstr("no-parent")));
  EXPECT_THAT(result.out, HasSubstr("1 error, 0 warnings"));
}

TEST_F(PlanCheck, AFileThatCannotBeReadIsAnError) {
  const ProcessResult result = check({"--facts", kMachine, "/nowhere/pools.yaml"});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.out, HasSubstr("/nowhere/pools.yaml: error: the file cannot be read"));
}

TEST_F(PlanCheck, WrongUsageIsStatus2) {
  EXPECT_EQ(check({"--no-such-option"}).status, 2);
  EXPECT_EQ(world.run("poolctl-plan", {}).status, 2);
}

TEST_F(PlanCheck, ReadsTheInstalledFilesWhenNoneIsNamed) {
  SKIP_WITHOUT_PRIVATE_ETC();
  world.definition("a.yaml", "- name: a\n  memMax: 512\n");
  writeFile(world.rpD() / "b.yaml", "- name: b\n  memMax: 512\n");
  const ProcessResult result = check({"--facts", kMachine});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.out, HasSubstr("/etc/rp.d/b.yaml: error: the file does not carry the "
                                    "installed mark [not-installed]\n"));
  EXPECT_THAT(result.out, HasSubstr("1 error, 0 warnings in 2 files"));
}

TEST(PlanFacts, AreReadBackAsTheSameMachine) {
  World world;
  const Arguments boot = {"boot", "--cpus", "6", "--memory", "3000", "--max-vms", "77", "--vm"};
  EXPECT_EQ(world.run("knobctl", boot).status, 0);
  const ProcessResult facts = world.run("poolctl-plan", {"facts"});
  EXPECT_EQ(facts.out,
            "numPCPUs: 6\nphysKB: 3072000\nmaxVMs: 77\nisVm: 1\nisInstaller: 0\n"
            "memoryCapacityMB: 3000\ncpuCapacityPercent: 600\n");
  writeFile(world.folder() / "facts", facts.out);
  writeFile(world.folder() / "a.yaml", "- name: a\n  memMin: !calc physKB / 1024 + isVm\n");
  writeFile(world.folder() / "knob.conf", "kernel = none\n");
  const ProcessResult check = world.run("poolctl-plan", {"check", "--facts", "facts", "a.yaml"});
  EXPECT_EQ(check.err, "");
  EXPECT_THAT(check.out, HasSubstr("asked: 3001 MB; the machine has 3000 MB"));
}

TEST(PlanFacts, ThatAreWrongAreRefusedWithTheReason) {
  const World world;
  const auto refusal = [&world](const std::string &text) {
    writeFile(world.folder() / "facts", text);
    const ProcessResult result =
        world.run("poolctl-plan", {"check", "--facts", "facts", "/dev/null"});
    EXPECT_EQ(result.status, 1) << text;
    return result.err;
  };
  EXPECT_THAT(refusal("numPCPUs: 6\n"), HasSubstr("facts: physKB is missing"));
  EXPECT_THAT(refusal("cpus: 6\n"), HasSubstr("unknown fact \"cpus\"; known are numPCPUs, "));
  EXPECT_THAT(refusal("numPCPUs: six\n"), HasSubstr("numPCPUs is not a number from 0 up"));
  EXPECT_THAT(refusal("- 5\n"), HasSubstr("not a mapping of facts"));
}

}  // namespace
