// SPDX-License-Identifier: Apache-2.0
// CPUs that are switched off and on while pools exist.
#include <gtest/gtest.h>
#include <sys/sysinfo.h>

#include <fstream>

#include "linux_world.h"

namespace Uml {
namespace {

constexpr const char *kThreeCpus = "- name: a\n  cpuMin: 150\n- name: b\n  cpuMin: 170\n";

class OfflineCpu : public LinuxTest {
 protected:
  void SetUp() override { ASSERT_EQ(get_nprocs(), 4); }
  ~OfflineCpu() override { lastCpu('1'); }

  static void lastCpu(char online) {
    std::ofstream("/sys/devices/system/cpu/cpu3/online") << online;
  }
};

TEST_F(OfflineCpu, IsNotPromisedToPools) {
  lastCpu('0');
  ASSERT_EQ(get_nprocs(), 3);
  EXPECT_NE(load(kThreeCpus).status, 0);
  lastCpu('1');
  EXPECT_TRUE(silentlyDone(load(kThreeCpus)));
}

TEST_F(OfflineCpu, LeavesThePoolsThatThereAreAndTheirSettings) {
  ASSERT_TRUE(silentlyDone(load(kThreeCpus)));
  const std::string weight = readControl("host/opt/a", "cpu.weight");
  lastCpu('0');
  Worker worker("host/opt/a", doNothing);
  EXPECT_TRUE(worker.waitUntilDone());
  EXPECT_EQ(readControl("host/opt/a", "cpu.weight"), weight);
  EXPECT_NE(load("- name: c\n  cpuMin: 1\n").status, 0);
}

}  // namespace
}  // namespace Uml
