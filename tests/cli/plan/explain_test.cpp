// SPDX-License-Identifier: Apache-2.0
// poolctl-plan explain and test as their users run them.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <string>

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

const std::string kMachine = PLAN_CASES "/machine.facts";

class PlanExplain : public testing::Test {
 protected:
  std::string explain(const std::string &yaml, const Arguments &arguments) const {
    writeFile(world.folder() / "pools.yaml", yaml);
    Arguments all = {"explain", "--facts", kMachine, "--file", "pools.yaml"};
    all.insert(all.end(), arguments.begin(), arguments.end());
    const ProcessResult result = world.run("poolctl-plan", all);
    EXPECT_EQ(result.status, 0) << result.err;
    return result.out;
  }

  World world;
};

TEST_F(PlanExplain, ShowsTheExpressionWithItsBracketsAndParts) {
  EXPECT_EQ(
      explain("- name: web\n  memMax: !calc max(physKB / 1024 / 8, 512)\n", {"web", "memMax"}),
      "host/opt/web\n"
      "  memMax 2048 = max((physKB / 1024) / 8, 512)  (pools.yaml:2:3)\n"
      "    physKB = 16777216 (" +
          kMachine +
          ")\n"
          "    physKB / 1024 = 16384\n"
          "    (physKB / 1024) / 8 = 2048\n");
}

TEST_F(PlanExplain, ShowsDefinitionsAndDefaults) {
  const std::string text = explain("- name: web\n  mem: !calc {base: 64, =: base * 2}\n", {"web"});
  EXPECT_THAT(text, HasSubstr("  memMin 128 = base * 2  (pools.yaml:2:3)\n"
                              "    base = 64 (defined here, plain)\n"));
  EXPECT_THAT(text, HasSubstr("  cpuShares 1000, the default\n"));
}

TEST_F(PlanExplain, ShowsWhetherTheStoreHasTheValue) {
  const std::string yaml =
      "- name: web\n  memMax: !config {object: [host, pools, web], key: size, default: 512}\n";
  EXPECT_THAT(explain(yaml, {"web", "memMax"}),
              HasSubstr("  memMax 512, the default (plain): there is no store: object host pools "
                        "web, field size"));
  EXPECT_EQ(world.run("kestrelctl", {"set", "host", "pools", "web", "size", "640"}).status, 0);
  EXPECT_THAT(explain(yaml, {"web", "memMax"}),
              HasSubstr("  memMax 640, from the store: object host pools web, field size"));
  EXPECT_EQ(world.run("kestrelctl", {"set", "host", "pools", "web", "size", "big"}).status, 0);
  EXPECT_THAT(explain(yaml, {"web", "memMax"}), HasSubstr("the field is not a number"));
}

TEST_F(PlanExplain, APoolThatIsNotDeclaredIsAnError) {
  writeFile(world.folder() / "pools.yaml", "- name: web\n  memMax: 512\n");
  const ProcessResult result =
      world.run("poolctl-plan", {"explain", "--facts", kMachine, "--file", "pools.yaml", "other"});
  EXPECT_EQ(result.status, 1);
  EXPECT_EQ(result.err, "poolctl-plan: host/opt/other: not declared\n");
}

class PlanTest : public testing::Test {
 protected:
  PlanTest() {
    writeFile(world.folder() / "pools.yaml",
              "- name: web\n  memMin: 1000\n  memMax: !calc physKB / 4096\n");
    machine("large", 8, 16777216);
  }

  void machine(const std::string &name, int cpus, long physKB) const {
    std::filesystem::create_directory(world.folder() / "hosts");
    writeFile(world.folder() / "hosts" / (name + ".facts"),
              "numPCPUs: " + std::to_string(cpus) + "\nphysKB: " + std::to_string(physKB) +
                  "\nmaxVMs: 1\nisVm: 0\nisInstaller: 0\n");
  }

  ProcessResult test(const Arguments &more = {}) const {
    Arguments arguments = {"test"};
    arguments.insert(arguments.end(), more.begin(), more.end());
    arguments.insert(arguments.end(), {"hosts", "pools.yaml"});
    return world.run("poolctl-plan", arguments);
  }

  World world;
};

TEST_F(PlanTest, NamesTheMachinesOnWhichTheSetDoesNotFit) {
  machine("small", 2, 2097152);
  const ProcessResult result = test();
  EXPECT_EQ(result.status, 1);
  EXPECT_EQ(result.out,
            "small: the set does not fit\n"
            "  host/opt/web: memMin 1000 is above memMax 512\n"
            "2 machines: the set does not fit on 1, the table differs on 0\n");
}

TEST_F(PlanTest, ComparesTheTables) {
  EXPECT_EQ(test({"--update"}).status, 0);
  EXPECT_THAT(::Test::readFile(world.folder() / "hosts" / "large.csv"),
              HasSubstr("\nhost/opt/web,yes,1000,4096,-,-,0,-,1000\n"));
  EXPECT_EQ(test().status, 0);
  writeFile(world.folder() / "pools.yaml",
            "- name: web\n  memMin: 1000\n  memMax: !calc physKB / 8192\n");
  const ProcessResult result = test();
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.out, HasSubstr("large: the table differs\n"
                                    "  -host/opt/web,yes,1000,4096,-,-,0,-,1000\n"
                                    "  +host/opt/web,yes,1000,2048,-,-,0,-,1000\n"));
}

// The table is the one that `poolctl list -v` prints on that machine.
TEST_F(PlanTest, TheTableIsThatOfList) {
  EXPECT_EQ(world.run("knobctl", {"boot", "--cpus", "8", "--memory", "16384"}).status, 0);
  EXPECT_EQ(test({"--update"}).status, 0);
  ::Test::setInstalledMark(world.folder() / "pools.yaml");
  EXPECT_EQ(::Test::readFile(world.folder() / "hosts" / "large.csv"),
            world.poolctl({"list", "-v", "pools.yaml"}).out);
}

TEST_F(PlanTest, DefinitionsWithErrorsAreRefused) {
  writeFile(world.folder() / "pools.yaml", "- name: web\n  memMax: 1G\n");
  const ProcessResult result = test();
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, HasSubstr("pools.yaml: has errors"));
}

TEST_F(PlanTest, AFolderWithoutFactsIsRefused) {
  const ProcessResult result = world.run("poolctl-plan", {"test", "/proc/self", "pools.yaml"});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, HasSubstr("has no files named *.facts"));
}

// A thousand machines and two hundred pools, in the time that a check of each change may take.
TEST_F(PlanTest, AFleetIsEvaluatedInSeconds) {
  for (int i = 0; i < 1000; ++i)
    machine("h" + std::to_string(i), 1 + i % 128, 16777216 + i * 4096L);
  std::string yaml;
  for (int i = 0; i < 200; ++i) {
    yaml += "- name: p" + std::to_string(i) +
            "\n  memMin: !calc physKB / 1024 / 512\n  memMax: !calc min(physKB / 4096, 8192)\n";
  }
  writeFile(world.folder() / "pools.yaml", yaml);
  const ProcessResult result = test();
  EXPECT_EQ(result.status, 0);
  EXPECT_THAT(result.out, HasSubstr("1001 machines: the set does not fit on 0"));
}

}  // namespace
