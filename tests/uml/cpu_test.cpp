// SPDX-License-Identifier: Apache-2.0
// What the CPU settings are worth, by the kernel's own account of the time that each group used.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "cpu_world.h"

namespace Uml {
namespace {

class Cpu : public CpuTest {};

TEST_F(Cpu, AMinimumOf75LeavesItsPoolAtLeast70PercentBesideABusyNeighbour) {
  ASSERT_TRUE(silentlyDone(load("- name: first\n  cpuMin: 75\n- name: other\n")));
  Worker first("host/opt/first", beBusy), other("host/opt/other", beBusy);
  const Meter firsts("host/opt/first"), others("host/opt/other");
  measure();
  const double used = firsts.percent(), rest = others.percent();
  EXPECT_GE(used / (used + rest), 0.70) << used << " and " << rest;
  EXPECT_GT(rest, 0.0);
}

TEST_F(Cpu, MoreProcessesInTheNeighbourMakeNoDifferenceToThat) {
  ASSERT_TRUE(silentlyDone(load("- name: first\n  cpuMin: 75\n- name: other\n")));
  Worker first("host/opt/first", beBusy);
  Worker a("host/opt/other", beBusy), b("host/opt/other", beBusy), c("host/opt/other", beBusy);
  const Meter firsts("host/opt/first"), others("host/opt/other");
  measure();
  const double used = firsts.percent(), rest = others.percent();
  EXPECT_GE(used / (used + rest), 0.70) << used << " and " << rest;
}

TEST_F(Cpu, WithoutTheMinimumBothGetTheSame) {
  ASSERT_TRUE(silentlyDone(load("- name: first\n- name: other\n")));
  Worker first("host/opt/first", beBusy), other("host/opt/other", beBusy);
  const Meter firsts("host/opt/first"), others("host/opt/other");
  measure();
  const double used = firsts.percent(), rest = others.percent();
  EXPECT_NEAR(used / (used + rest), 0.5, 0.05) << used << " and " << rest;
}

TEST_F(Cpu, TheMinimumOfAPoolBelowAnotherReachesUpToTheRoot) {
  ASSERT_TRUE(silentlyDone(load("- name: a\n- name: a/first\n  cpuMin: 75\n- name: host/other\n")));
  Worker first("host/opt/a/first", beBusy), other("host/other", beBusy);
  const Meter firsts("host/opt/a/first"), others("host/other");
  measure();
  const double used = firsts.percent(), rest = others.percent();
  EXPECT_GE(used / (used + rest), 0.70) << used << " and " << rest;
}

TEST_F(Cpu, AMaximumOf20HoldsOnAMachineThatIsOtherwiseIdle) {
  ASSERT_TRUE(silentlyDone(load("- name: capped\n  cpuMax: 20\n")));
  Worker a("host/opt/capped", beBusy), b("host/opt/capped", beBusy);
  const Meter capped("host/opt/capped");
  measure();
  EXPECT_NEAR(capped.percent(), 20.0, 3.0);
}

TEST_F(Cpu, AMinimumOf20TakesItsFairThirdBesideTwoBusySlices) {
  makeSlice("a.slice", 100);
  makeSlice("b.slice", 100);
  ASSERT_TRUE(silentlyDone(load("- name: pool\n  cpuMin: 20\n")));
  for (const char *group : {"host/opt/pool", "a.slice", "b.slice"}) addBusyProcess(group);
  EXPECT_NEAR(partsOf({"host/opt/pool", "a.slice", "b.slice"})[0], 33.3, 3.0);
}

TEST_F(Cpu, AMinimumOf40IsKeptBesideAHeavySliceAndTakesLittleMore) {
  makeSlice("heavy.slice", 1000);
  ASSERT_TRUE(silentlyDone(load("- name: pool\n  cpuMin: 40\n")));
  addBusyProcess("host/opt/pool");
  for (int i = 0; i < 4; ++i) addBusyProcess("heavy.slice");
  const double part = partsOf({"host/opt/pool", "heavy.slice"})[0];
  EXPECT_GE(part, 40.0 - 1.0);
  EXPECT_LE(part, 43.3 + 3.0);
}

TEST_F(Cpu, MinimaOf30And50AreKeptBesideTenSiblingsAndASlice) {
  makeSlice("a.slice", 100);
  std::string pools = "- name: small\n  cpuMin: 30\n- name: large\n  cpuMin: 50\n";
  for (int i = 0; i < 10; ++i) pools += "- name: other" + std::to_string(i) + "\n";
  ASSERT_TRUE(silentlyDone(load(pools)));
  for (const char *group : {"host/opt/small", "host/opt/large", "a.slice"}) addBusyProcess(group);
  for (int i = 0; i < 10; ++i) addBusyProcess("host/opt/other" + std::to_string(i));
  const std::vector<double> parts =
      partsOf({"host/opt/small", "host/opt/large", "host", "a.slice"});
  const double machine = (parts[2] + parts[3]) / 100;
  EXPECT_GE(parts[0] / machine, 30.0 - 1.0);
  EXPECT_GE(parts[1] / machine, 50.0 - 1.0);
  EXPECT_LE(parts[2] / machine, 81.3 + 3.0) << "host itself";
}

}  // namespace
}  // namespace Uml
