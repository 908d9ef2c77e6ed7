// SPDX-License-Identifier: Apache-2.0
// The list command: its two forms, byte for byte.
#include "cli_fixture.h"
#include "usage_texts.h"

namespace Test {
namespace {

const std::string kTableHeader = tableLine({"name", "auto", "memMin", "memMax", "memMinLimit",
                                            "memShares", "cpuMin", "cpuMax", "cpuShares"});

class List : public Cli {
 protected:
  // The line of the one pool in CSV form.
  std::string csv(const std::string &yaml) {
    const ProcessResult result = world.poolctl({"list", "-v", world.file("pools.yaml", yaml)});
    EXPECT_EQ(result.err, "");
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.out.substr(0, kCsvHeader.size()), kCsvHeader);
    return result.out.substr(std::min(kCsvHeader.size(), result.out.size()));
  }
};

class ListRpD : public CliWithRpD {};

TEST_F(List, TableHeaderIsPaddedAndSeparatedByNulBytes) {
  const auto file = world.file("empty.yaml", "");
  std::string expected = "name" + std::string(44, ' ');
  for (const std::string title : {"        auto", "      memMin", "      memMax", " memMinLimit",
                                  "   memShares", "      cpuMin", "      cpuMax", "   cpuShares"})
    expected += '\0' + title;
  const ProcessResult result = world.poolctl({"list", file});
  expectRun(result, 0, expected + "\n", "");
  EXPECT_EQ(result.out.size(), 152u + 1);
}

TEST_F(List, TableShowsAPoolsNineValues) {
  const auto file = world.file("a.yaml",
                               "- {name: vim, memMin: 512, memMax: 1024, memMinLimit: 600, "
                               "memShares: 5, cpuMin: 10, cpuMax: 50, cpuShares: 7}\n");
  const ProcessResult result = world.poolctl({"list", file});
  const std::string line =
      tableLine({"host/opt/vim", "yes", "512", "1024", "600", "5", "10", "50", "7"});
  EXPECT_EQ(line.size(), 152u + 1);
  expectRun(result, 0, kTableHeader + line, "");
}

TEST_F(List, EachLineIsWrittenAsSoonAsItIsKnown) {
  world.hostCalls();
  const auto file = world.file("pools.yaml", "- name: host/a\n- name: host/b\n");
  expectRun(world.poolctl({"list", file}), 0,
            kTableHeader + tableLine({"host/a", "yes", "0", "-", "-", "-", "0", "-", "1000"}) +
                tableLine({"host/b", "yes", "0", "-", "-", "-", "0", "-", "1000"}),
            "");
  EXPECT_EQ(world.flushes(), (Calls{"flush 153", "flush 153", "flush 153"}));
}

TEST_F(List, CsvHasNoPadding) {
  EXPECT_EQ(csv("- {name: host/vim, memMin: 512, memShares: -3, cpuMin: -1, cpuShares: -1}\n"),
            "host/vim,yes,512,-,-,normal,-,-,-\n");
}

TEST_F(List, CsvShowsThatWhatIsNotGivenIsADashOrItsDefault) {
  EXPECT_EQ(csv("- name: a\n"), "host/opt/a,yes,0,-,-,-,0,-,1000\n");
}

TEST_F(List, ADisabledPoolIsNotAutomatic) {
  EXPECT_EQ(csv("- {name: a, isEnabled: false}\n"), "host/opt/a,no,0,-,-,-,0,-,1000\n");
}

TEST_F(List, SharesHaveWordsForMinusTwoToMinusFourAlone) {
  EXPECT_EQ(csv("- {name: a, memShares: -1, cpuShares: -2}\n"
                "- {name: b, memShares: -2, cpuShares: -3}\n"
                "- {name: c, memShares: -3, cpuShares: -4}\n"
                "- {name: d, memShares: -4, cpuShares: -5}\n"
                "- {name: e, memShares: -5, cpuShares: 0}\n"),
            "host/opt/a,yes,0,-,-,-,0,-,low\n"
            "host/opt/b,yes,0,-,-,low,0,-,normal\n"
            "host/opt/c,yes,0,-,-,normal,0,-,high\n"
            "host/opt/d,yes,0,-,-,high,0,-,-5\n"
            "host/opt/e,yes,0,-,-,-5,0,-,0\n");
}

TEST_F(List, OtherNegativesAreNumbersInEveryColumn) {
  EXPECT_EQ(csv("- {name: a, memMin: -2, memMax: -3, memMinLimit: -4, cpuMin: -2, cpuMax: -4}\n"),
            "host/opt/a,yes,-2,-3,-4,-,-2,-4,1000\n");
}

TEST_F(List, AValueThatDoesNotFitShowsTheMostNegativeNumber) {
  EXPECT_EQ(csv("- {name: a, memMax: .inf, cpuMax: .nan, memMin: 1e30, cpuMin: 3e9}\n"),
            "host/opt/a,yes,-9223372036854775808,-9223372036854775808,-,-,-2147483648,-2147483648,"
            "1000\n");
}

TEST_F(List, ALongValueShiftsTheTable) {
  const auto file = world.file("a.yaml", "- {name: a, memMax: .inf}\n");
  EXPECT_EQ(world.poolctl({"list", file}).out,
            kTableHeader + tableLine({"host/opt/a", "yes", "0", "-9223372036854775808", "-", "-",
                                      "0", "-", "1000"}));
}

TEST_F(List, ALongNameShiftsTheTableAndIsNotCut) {
  const std::string name = "host/" + std::string(60, 'n');
  const auto file = world.file("a.yaml", "- name: " + name + "\n");
  EXPECT_EQ(world.poolctl({"list", file}).out,
            kTableHeader + tableLine({name, "yes", "0", "-", "-", "-", "0", "-", "1000"}));
}

TEST_F(List, CsvQuotesNothing) {
  EXPECT_EQ(csv("- name: 'a, \"b\"'\n"), "host/opt/a, \"b\",yes,0,-,-,-,0,-,1000\n");
}

TEST_F(List, PoolsOfNamedFilesComeSortedByName) {
  const auto first = world.file("1.yaml", "- name: c\n- name: host/a\n");
  const auto second = world.file("2.yaml", "- name: b\n- name: B\n");
  const std::string rest = ",yes,0,-,-,-,0,-,1000\n";
  EXPECT_EQ(world.poolctl({"list", "-v", first, second}).out,
            kCsvHeader + "host/a" + rest + "host/opt/B" + rest + "host/opt/b" + rest +
                "host/opt/c" + rest);
}

TEST_F(List, ANameDefinedTwicePrintsTwice) {
  const auto first = world.file("1.yaml", "- name: a\n");
  const std::string line = "host/opt/a,yes,0,-,-,-,0,-,1000\n";
  EXPECT_EQ(world.poolctl({"list", "-v", first, first}).out, kCsvHeader + line + line);
}

TEST_F(List, AnOptionBehindTheFilesCounts) {
  const auto file = world.file("empty.yaml", "");
  expectRun(world.poolctl({"list", file, "-v"}), 0, kCsvHeader, "");
}

TEST_F(List, WhatFollowsADoubleDashIsAFile) {
  expectRun(world.poolctl({"list", "--", "-v"}), 1, kTableHeader, "-v: is not installed\n");
}

TEST_F(List, HelpWinsInEitherOrder) {
  expectRun(world.poolctl({"list", "-v", "-h"}), 0, "", kListUsage);
  expectRun(world.poolctl({"list", "-h", "-v"}), 0, "", kListUsage);
}

TEST_F(List, AnUnknownOptionLeavesStandardOutputEmpty) {
  expectRun(world.poolctl({"list", "-vx"}), 1, "",
            std::string("list: invalid option -- 'x'\n") + kListUsage);
}

TEST_F(List, TheHeaderComesBeforeTheErrorOfABadDefinition) {
  const auto good = world.file("1.yaml", "- name: a\n"), bad = world.file("2.yaml", "- b\n");
  const std::string error = bad.string() + ": line 1 column 3: expected a map\n";
  expectRun(world.poolctl({"list", "-v", good, bad}), 1, kCsvHeader, error);
  EXPECT_EQ(world.poolctl({"list", "-v", good, bad}, Streams::kMerged).out, kCsvHeader + error);
}

TEST_F(List, AsksTheKernelForTheFourFactsOnceAndForNothingElse) {
  const auto file = world.file("a.yaml", "- name: a\n- {name: b, mem: !calc physKB / 1024}\n");
  world.poolctl({"list", file, file});
  EXPECT_EQ(world.everyCall(),
            (Calls{"KNOB_CheckSig size=21 -> 0",
                   "KNOB_Get hardware_cpu_cpuInfo instance=null output=38 -> 0",
                   "KNOB_Get system_vmLimits instance=null output=32 -> 0",
                   "KNOB_Get system_bootCmdLine instance=null output=4096 -> 0",
                   "KNOB_Get memory_comprehensive instance=null output=80 -> 0"}));
}

TEST_F(List, AsksTheKernelForNothingWhenThereIsNoPool) {
  world.poolctl({"list", world.file("empty.yaml", "[]\n")});
  EXPECT_EQ(world.kernelCalls(), Calls{});
}

TEST_F(List, ShowsValuesComputedFromTheFactsOfTheMachine) {
  for (const char *fact :
       {"cpus 12", "max-vms 99", "vm", "memory-kb 8388608", "cmdline quiet xrunotterx"})
    world.knob(fact);
  EXPECT_EQ(csv("- {name: a, memMin: !calc physKB / 1024, memMax: !calc maxVMs, cpuMin: !calc "
                "numPCPUs / 2, cpuMax: !calc isInstaller + 1, isEnabled: !calc isVm}\n"),
            "host/opt/a,yes,8192,99,-,-,6,2,1000\n");
}

TEST_F(List, MemoryBeyondTheSignedRangeIsStillALargeNumber) {
  world.knob("memory-kb 9223372036854775808");
  EXPECT_EQ(csv("- {name: a, memMin: !calc physKB / 1048576}\n"),
            "host/opt/a,yes,8796093022208,-,-,-,0,-,1000\n");
}

TEST_F(ListRpD, WithoutFilesPrintsTheHeaderAloneForAnEmptyFolder) {
  expectRun(world.poolctl({"list"}), 0, kTableHeader, "");
}

TEST_F(ListRpD, WithoutFilesReadsEveryDefinition) {
  world.definition("b.yaml", "- name: x\n");
  world.definition("a", "- name: y\n");
  const std::string rest = ",yes,0,-,-,-,0,-,1000\n";
  expectRun(world.poolctl({"list", "-v"}), 0,
            kCsvHeader + "host/opt/x" + rest + "host/opt/y" + rest, "");
}

}  // namespace
}  // namespace Test
