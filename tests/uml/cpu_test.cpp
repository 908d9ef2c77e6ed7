// SPDX-License-Identifier: Apache-2.0
// What the CPU settings are worth, by the kernel's own account of the time that each group used.
#include <gtest/gtest.h>

#include <chrono>
#include <thread>

#include "linux_world.h"

namespace Uml {
namespace {

using Clock = std::chrono::steady_clock;

// What share of the time that passes a group uses, in percent of one CPU.
class Meter {
 public:
  explicit Meter(const std::string &group)
      : group_(group), used_(usedNow()), since_(Clock::now()) {}

  double percent() const {
    const std::chrono::duration<double, std::micro> passed = Clock::now() - since_;
    return 100.0 * static_cast<double>(usedNow() - used_) / passed.count();
  }

 private:
  int64_t usedNow() const { return numberIn(group_, "cpu.stat", "usage_usec"); }

  std::string group_;
  int64_t used_;
  Clock::time_point since_;
};

// Long enough for 60 of the kernel's periods, over which it keeps its promises.
void measure() {
  std::this_thread::sleep_for(std::chrono::seconds(6));
}

class Cpu : public LinuxTest {};

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

}  // namespace
}  // namespace Uml
