// SPDX-License-Identifier: Apache-2.0
// No change of settings ever kills a process: what its memory is in the way of is answered "busy".
#include <gtest/gtest.h>

#include <chrono>
#include <future>
#include <thread>

#include "linux_world.h"

namespace Uml {
namespace {

const std::string kPool = "host/opt/web";

constexpr const char *kDefinition =
    "- name: web\n  memMin: 32\n  memMax: 128\n  memShares: 500\n  memMinLimit: 64\n";

std::string settingsOf(const std::string &group) {
  std::string all;
  for (const char *file : {"memory.min", "memory.max", "memory.high", "memory.low", "cpu.weight",
                           "cpu.max", "cgroup.subtree_control"})
    all += std::string(file) + ": " + readControl(group, file) + "\n";
  return all;
}

std::string settingsOfAll() {
  std::string all;
  for (const std::string &group : allGroups()) all += group + "\n" + settingsOf(group);
  return all;
}

class NoKilling : public LinuxTest {
 protected:
  NoKilling() { world.definition("web.yaml", kDefinition); }

  void SetUp() override { ASSERT_TRUE(silentlyDone(world.poolctl({"load"}))); }

  // The command is answered "busy" with that status, changes nothing, and kills nobody.
  void expectBusy(const ::Test::Arguments &arguments, int status, Worker &worker) {
    const std::string before = settingsOfAll();
    const ::Test::ProcessResult result = world.poolctl(arguments);
    EXPECT_EQ(result.status, status) << result.err;
    EXPECT_NE(result.err.find("busy"), std::string::npos) << result.err;
    EXPECT_EQ(settingsOfAll(), before);
    EXPECT_TRUE(worker.alive());
    EXPECT_EQ(oomKills(), 0);
  }
};

TEST_F(NoKilling, DisableOfAPoolInUseIsBusy) {
  Worker worker(kPool, holdMB(56));
  ASSERT_TRUE(worker.waitUntilDone());
  expectBusy({"disable", kPool}, 1, worker);
}

TEST_F(NoKilling, DisableWithoutDeletingIsBusy) {
  Worker worker(kPool, holdMB(56));
  ASSERT_TRUE(worker.waitUntilDone());
  expectBusy({"disable", "-n", kPool}, 1, worker);
}

TEST_F(NoKilling, DisableThatWaitsGivesUpAtItsDeadline) {
  Worker worker(kPool, holdMB(56));
  ASSERT_TRUE(worker.waitUntilDone());
  const auto begin = std::chrono::steady_clock::now();
  expectBusy({"disable", "-w", "2", kPool}, 1, worker);
  EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::seconds(1));
}

TEST_F(NoKilling, DisableThatWaitsSucceedsOnceTheProcessesEnd) {
  Worker worker(kPool, holdMB(56));
  ASSERT_TRUE(worker.waitUntilDone());
  auto command = std::async(std::launch::async, [&] {
    return world.poolctl({"disable", "-w", "30", kPool});
  });
  EXPECT_EQ(command.wait_for(std::chrono::milliseconds(1500)), std::future_status::timeout);
  EXPECT_EQ(oomKills(), 0);
  EXPECT_TRUE(worker.alive());
  worker.end();
  EXPECT_TRUE(silentlyDone(command.get()));
  EXPECT_FALSE(groupExists(kPool));
  EXPECT_EQ(numberIn("host", "memory.min"), 0);
}

TEST_F(NoKilling, AProcessThatBroughtItsMemoryFromElsewhereIsNotKilledByItsNextPage) {
  int wakeUp[2];
  ASSERT_EQ(pipe(wakeUp), 0);
  Worker worker(kPool, [&] {
    char byte = 0;
    if (read(wakeUp[0], &byte, 1) == 1) holdMB(4)();
  });
  expectBusy({"disable", "-n", kPool}, 1, worker);
  ASSERT_EQ(write(wakeUp[1], "x", 1), 1);
  EXPECT_TRUE(worker.waitUntilDone());
  EXPECT_TRUE(worker.alive());
  EXPECT_EQ(oomKills(), 0);
  close(wakeUp[0]);
  close(wakeUp[1]);
}

TEST_F(NoKilling, SizingAPoolBelowWhatItHoldsIsBusy) {
  Worker worker(kPool, holdMB(56));
  ASSERT_TRUE(worker.waitUntilDone());
  expectBusy({"-g", kPool, "-m", "40"}, 4, worker);
}

TEST_F(NoKilling, SizingAPoolToZeroIsBusy) {
  Worker worker(kPool, holdMB(56));
  ASSERT_TRUE(worker.waitUntilDone());
  expectBusy({"-g", kPool, "-m", "0"}, 4, worker);
}

TEST_F(NoKilling, SizingAPoolToRoomForWhatItHoldsIsDone) {
  Worker worker(kPool, holdMB(40));
  ASSERT_TRUE(worker.waitUntilDone());
  EXPECT_TRUE(silentlyDone(world.poolctl({"-g", kPool, "-m", "60"})));
  EXPECT_EQ(numberIn(kPool, "memory.max"), 60 * kMiB);
  EXPECT_EQ(numberIn(kPool, "memory.high"), kMax);
  EXPECT_TRUE(worker.alive());
  EXPECT_EQ(oomKills(), 0);
}

TEST_F(NoKilling, PageCacheIsGivenBackWhereItIsInTheWay) {
  const auto file = world.folder() / "file";
  ::Test::writeFile(file, "");
  std::filesystem::resize_file(file, 100 * kMiB);
  Worker worker(kPool, readThrough(file));
  ASSERT_TRUE(worker.waitUntilDone());
  ASSERT_GT(numberIn(kPool, "memory.current"), 90 * kMiB);
  EXPECT_TRUE(silentlyDone(world.poolctl({"-g", kPool, "-m", "48"})));
  EXPECT_EQ(numberIn(kPool, "memory.max"), 48 * kMiB);
  EXPECT_TRUE(worker.alive());
  EXPECT_EQ(oomKills(), 0);
}

TEST_F(NoKilling, EnableWithASmallerMaximumThanIsInUseSaysBusyAndGoesOn) {
  // A disabled pool that somebody's processes entered all the same.
  ASSERT_TRUE(silentlyDone(world.poolctl({"disable", "-n", kPool})));
  ASSERT_TRUE(silentlyDone(world.poolctl({"enable", kPool})));
  Worker worker(kPool, holdMB(56));
  ASSERT_TRUE(worker.waitUntilDone());
  const std::string before = settingsOfAll();
  EXPECT_TRUE(silentlyDone(world.poolctl({"enable", kPool})));
  EXPECT_EQ(settingsOfAll(), before);
  EXPECT_TRUE(worker.alive());
  EXPECT_EQ(oomKills(), 0);
}

TEST_F(NoKilling, ProcessesInAPoolBelowCountAsWell) {
  ASSERT_TRUE(silentlyDone(load("- name: outer\n  memMax: 128\n- name: outer/inner\n")));
  Worker worker("host/opt/outer/inner", holdMB(56));
  ASSERT_TRUE(worker.waitUntilDone());
  expectBusy({"disable", "-n", "host/opt/outer"}, 1, worker);
  expectBusy({"-g", "host/opt/outer", "-m", "40"}, 4, worker);
}

TEST_F(NoKilling, UnloadOfAPoolInUseIsBusyAndBringsBackWhatItHadDeleted) {
  world.definition("web.yaml", std::string(kDefinition) + "- name: web2\n  memMin: 16\n");
  ASSERT_EQ(world.poolctl({"load"}).status, 0);
  Worker worker(kPool, holdMB(8));
  ASSERT_TRUE(worker.waitUntilDone());
  expectBusy({"unload"}, 1, worker);
}

TEST_F(NoKilling, AMaximumIsLoweredAtOnceWhereNobodyLives) {
  EXPECT_TRUE(silentlyDone(world.poolctl({"disable", "-n", kPool})));
  EXPECT_EQ(numberIn(kPool, "memory.max"), 0);
  EXPECT_EQ(numberIn(kPool, "memory.min"), 0);
}

}  // namespace
}  // namespace Uml
