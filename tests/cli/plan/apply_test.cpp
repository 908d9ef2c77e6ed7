// SPDX-License-Identifier: Apache-2.0
// poolctl-plan diff and apply as their users run them, on an emulated kernel of 4 CPUs and 8192 MB.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

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

// A process that lives for as long as a test holds it.
class Sleeper {
 public:
  Sleeper() : pid_(fork()) {
    if (pid_ == 0) {
      for (;;) pause();
    }
  }
  Sleeper(const Sleeper &) = delete;
  Sleeper &operator=(const Sleeper &) = delete;
  ~Sleeper() {
    (void)kill(pid_, SIGKILL);
    (void)waitpid(pid_, nullptr, 0);
  }

  std::string number() const { return std::to_string(pid_); }

 private:
  pid_t pid_;
};

class PlanApply : public testing::Test {
 protected:
  PlanApply() { knobctl({"boot", "--cpus", "4", "--memory", "8192"}); }

  void knobctl(const Arguments &arguments) const {
    const ProcessResult result = world.run("knobctl", arguments);
    EXPECT_EQ(result.status, 0) << result.err;
  }

  void declare(const std::string &yaml) { file_ = world.file("pools.yaml", yaml).string(); }

  ProcessResult plan(Arguments arguments) const {
    arguments.push_back(file_);
    return world.run("poolctl-plan", arguments);
  }

  void load() const { EXPECT_EQ(world.poolctl({"load", file_}).status, 0); }

  std::string stats(const std::string &path) const {
    return world.run("knobctl", {"stats", path}).out;
  }

  // Whether the kernel is as declared.
  void expectNoDifference() const {
    const ProcessResult result = plan({"diff"});
    EXPECT_EQ(result.out, "");
    EXPECT_EQ(result.err, "");
    EXPECT_EQ(result.status, 0);
  }

  World world;

 private:
  std::string file_;
};

TEST_F(PlanApply, AfterALoadNothingDiffers) {
  declare("- name: a\n  memMin: 100\n  memMax: 200\n- name: a/b\n  cpuMin: 20\n  memShares: -2\n");
  load();
  expectNoDifference();
}

TEST_F(PlanApply, DiffShowsMissingAndDifferentPools) {
  declare("- name: a\n  memMax: 128\n");
  load();
  declare("- name: a\n  memMax: 160\n- name: b\n  memMax: 16\n");
  const ProcessResult result = plan({"diff"});
  EXPECT_EQ(result.status, 1);
  EXPECT_EQ(result.out,
            "STATE    POOL        KEY     DECLARED  KERNEL\n"
            "differs  host/opt/a  memMax  160       128\n"
            "missing  host/opt/b\n");
}

TEST_F(PlanApply, DiffShowsGroupsThatNoDefinitionDeclares) {
  SKIP_WITHOUT_PRIVATE_ETC();
  world.definition("a.yaml", "- name: a\n  memMax: 128\n");
  EXPECT_EQ(world.poolctl({"load"}).status, 0);
  knobctl({"create", "host/opt/other"});
  const ProcessResult result = world.run("poolctl-plan", {"diff", "--json"});
  EXPECT_EQ(result.status, 1);
  EXPECT_EQ(
      json::parse(result.out),
      json::parse(R"({"differences": [{"state": "not declared", "pool": "host/opt/other"}]})"));
}

// What a load leaves that is killed between two calls of the kernel.
TEST_F(PlanApply, AHalfMadePoolIsShownAndFinished) {
  declare("- name: a\n  memMin: 64\n  memMax: 128\n  cpuMin: 10\n");
  knobctl({"create", "host/opt/a"});
  EXPECT_THAT(plan({"diff"}).out,
              HasSubstr("half made  host/opt/a  neither memory nor CPU is set"));
  EXPECT_EQ(plan({"apply"}).status, 0);
  expectNoDifference();
}

TEST_F(PlanApply, AStoppedApplyIsFinishedByTheNext) {
  std::string yaml;
  for (int i = 0; i < 200; ++i) yaml += "- name: p" + std::to_string(i) + "\n  memMax: 64\n";
  declare(yaml);
  ::Test::Command command;
  command.program = "/bin/sh";
  command.arguments = {"-c", "poolctl-plan apply pools.yaml >/dev/null & sleep 0.05; kill -9 $!"};
  command.environment = world.environment;
  command.workingFolder = world.folder();
  (void)::Test::run(command);
  EXPECT_EQ(plan({"apply"}).err, "");
  expectNoDifference();
}

TEST_F(PlanApply, DryRunPrintsThePlanAndChangesNothing) {
  declare("- name: a\n  memMax: 128\n");
  const ProcessResult result = plan({"apply", "--dry-run"});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.out, HasSubstr("create host/opt/a: memMin 0, memMax 128"));
  EXPECT_THAT(plan({"diff"}).out, HasSubstr("missing  host/opt/a"));
}

TEST_F(PlanApply, ASettingIsChangedInPlace) {
  declare("- name: a\n  memMax: 128\n");
  load();
  const std::string before = stats("host/opt/a");
  declare("- name: a\n  memMax: 160\n");
  const ProcessResult result = plan({"apply"});
  EXPECT_EQ(result.out, "set host/opt/a: memMax 128 -> 160\n1 of 1 step done\n");
  EXPECT_EQ(result.status, 0);
  const auto id = [](const std::string &text) { return text.substr(text.find("id "), 40); };
  EXPECT_EQ(id(stats("host/opt/a")), id(before));
  expectNoDifference();
}

// Each pair of sizes fits only when what makes room comes first.
TEST_F(PlanApply, ShrinksBeforeItGrows) {
  declare("- name: a\n  memMin: 8000\n- name: z\n  memMin: 100\n");
  load();
  declare("- name: a\n  memMin: 100\n- name: z\n  memMin: 8000\n");
  EXPECT_EQ(plan({"apply"}).status, 0);
  expectNoDifference();
  declare("- name: a\n  memMin: 8000\n- name: z\n  memMin: 100\n");
  EXPECT_EQ(plan({"apply"}).status, 0);
  expectNoDifference();
}

TEST_F(PlanApply, ParentsGrowFirstAndShrinkLast) {
  const std::string small =
      "- name: a\n  mem: 100\n- name: a/b\n  mem: 100\n- name: a/b/c\n  mem: 90\n";
  const std::string large =
      "- name: a\n  mem: 900\n- name: a/b\n  mem: 800\n- name: a/b/c\n  mem: 700\n";
  declare(small);
  load();
  for (const std::string &next : {large, small}) {
    declare(next);
    const ProcessResult result = plan({"apply"});
    EXPECT_EQ(result.err, "");
    EXPECT_EQ(result.status, 0) << result.out;
    expectNoDifference();
  }
}

TEST_F(PlanApply, ASetThatDoesNotFitChangesNothing) {
  declare("- name: a\n  memMin: 100\n");
  load();
  declare("- name: a\n  memMin: 5000\n- name: b\n  memMin: 5000\n");
  const ProcessResult result = plan({"apply"});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, HasSubstr("asked: 5000 MB; the machine has 8192 MB"));
  EXPECT_THAT(result.err, HasSubstr("nothing is changed"));
  EXPECT_THAT(stats("host/opt/a"), HasSubstr("memory min MB             100\n"));
}

TEST_F(PlanApply, DefinitionsWithErrorsChangeNothing) {
  declare("- name: a\n  memMax: 1G\n");
  const ProcessResult result = plan({"apply"});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, HasSubstr(":2:12: error"));
  EXPECT_EQ(result.out, "");
}

TEST_F(PlanApply, WhatIsBusyIsReportedAndTheRestGoesOn) {
  knobctl({"create", "host/opt/a"});
  const Sleeper sleeper;
  knobctl({"join", "host/opt/a", sleeper.number()});
  declare("- name: a\n  memMax: 64\n- name: a/b\n  memMax: 32\n- name: c\n  memMax: 64\n");
  const ProcessResult result = plan({"apply", "-w", "1"});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, HasSubstr("not done: create host/opt/a/b: "));
  EXPECT_THAT(result.err, HasSubstr("busy"));
  EXPECT_THAT(stats("host/opt/c"), HasSubstr("memory max MB             64\n"));
}

class PlanPrune : public PlanApply {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ETC();
    world.definition("a.yaml", "- name: a\n  memMax: 128\n");
    EXPECT_EQ(world.poolctl({"load"}).status, 0);
  }

  ProcessResult prune() const { return world.run("poolctl-plan", {"apply", "--prune"}); }
};

TEST_F(PlanPrune, DeletesEmptyGroupsThatAreNotDeclared) {
  knobctl({"create", "host/opt/x"});
  knobctl({"create", "host/opt/x/y"});
  const ProcessResult result = prune();
  EXPECT_EQ(result.out, "delete host/opt/x/y\ndelete host/opt/x\n2 of 2 steps done\n");
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(stats("host/opt/x"), "");
  EXPECT_NE(stats("host/opt/a"), "");
}

TEST_F(PlanPrune, LeavesGroupsWithProcesses) {
  knobctl({"create", "host/opt/x"});
  const Sleeper sleeper;
  knobctl({"join", "host/opt/x", sleeper.number()});
  const ProcessResult result = prune();
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.out, HasSubstr("cannot change host/opt/x: not deleted: 1 processes"));
  EXPECT_NE(stats("host/opt/x"), "");
}

TEST_F(PlanPrune, IsNotAllowedForSingleFiles) {
  EXPECT_EQ(world.run("poolctl-plan", {"apply", "--prune", "/etc/rp.d/a.yaml"}).status, 2);
}

TEST_F(PlanPrune, IsNotDoneWithoutTheOption) {
  knobctl({"create", "host/opt/x"});
  EXPECT_EQ(world.run("poolctl-plan", {"apply"}).status, 0);
  EXPECT_NE(stats("host/opt/x"), "");
}

}  // namespace
