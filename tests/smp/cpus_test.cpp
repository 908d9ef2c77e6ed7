// SPDX-License-Identifier: Apache-2.0
// CPU reservations of more than one CPU, and of one thread on a machine of several: floors and
// parts within two percent of the machine, by the kernel's own account, while all are busy.
#include <gtest/gtest.h>
#include <sys/sysinfo.h>

#include <vector>

#include "cpu_world.h"

namespace Uml {
namespace {

constexpr int kCpus = 4, kThreads = 8;
constexpr double kTolerance = 2.0 * kCpus;  // percent of one CPU

class Cpus : public CpuTest {
 protected:
  void SetUp() override {
    ASSERT_EQ(get_nprocs(), kCpus);
    makeSlice("foreign.slice", 100);
    addBusyProcesses("foreign.slice", kThreads);
  }

  void addBusyProcesses(const std::string &group, int count) {
    for (int i = 0; i < count; ++i) addBusyProcess(group);
  }

  // In percent of one CPU, once the kernel has spread the threads over the CPUs.
  static std::vector<double> usedBy(const std::vector<std::string> &groups) {
    measure();
    std::vector<double> used = partsOf(groups, std::chrono::seconds(20));
    for (double &part : used) part *= kCpus;
    return used;
  }
};

TEST_F(Cpus, AMinimumOf150IsKeptAndHostTakesItsFairPart) {
  ASSERT_TRUE(silentlyDone(load("- name: first\n  cpuMin: 150\n- name: other\n")));
  addBusyProcesses("host/opt/first", kThreads);
  addBusyProcesses("host/opt/other", kThreads);
  const auto used = usedBy({"host/opt/first", "host/opt/other", "foreign.slice"});
  EXPECT_GE(used[0], 150 - kTolerance);
  EXPECT_GT(used[1], 0);
  EXPECT_NEAR(used[2], 200, kTolerance) << used[0] << " and " << used[1];
}

TEST_F(Cpus, MinimaOf150And200AreKeptBesideTenSiblings) {
  std::string pools = "- name: a\n  cpuMin: 150\n- name: b\n  cpuMin: 200\n";
  for (int i = 0; i < 10; ++i) pools += "- name: other" + std::to_string(i) + "\n";
  ASSERT_TRUE(silentlyDone(load(pools)));
  std::vector<std::string> groups{"host/opt/a", "host/opt/b", "foreign.slice"};
  addBusyProcesses("host/opt/a", kThreads);
  addBusyProcesses("host/opt/b", kThreads);
  for (int i = 0; i < 10; ++i) {
    groups.push_back("host/opt/other" + std::to_string(i));
    addBusyProcess(groups.back());
  }
  const auto used = usedBy(groups);
  EXPECT_GE(used[0], 150 - kTolerance);
  EXPECT_GE(used[1], 200 - kTolerance);
}

TEST_F(Cpus, AMinimumOf90IsKeptByOneThread) {
  ASSERT_TRUE(silentlyDone(load("- name: single\n  cpuMin: 90\n- name: other\n")));
  addBusyProcess("host/opt/single");
  addBusyProcesses("host/opt/other", kThreads);
  EXPECT_GE(usedBy({"host/opt/single", "host/opt/other", "foreign.slice"})[0], 90 - kTolerance);
}

}  // namespace
}  // namespace Uml
