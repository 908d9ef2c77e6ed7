// SPDX-License-Identifier: Apache-2.0
// Any number of processes work on one kernel, and any of them may die at any moment.
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <csignal>
#include <functional>
#include <thread>

#include "contract_test.h"

namespace Contract {
namespace {

constexpr int kProcesses = 4;

// A process whose exit status is what its work returns: 0 for success.
pid_t startProcess(const std::function<int()> &work) {
  const pid_t pid = ::fork();
  if (pid == 0) ::_exit(work());
  return pid;
}

int exitStatusOf(pid_t pid) {
  int status = 0;
  if (::waitpid(pid, &status, 0) != pid || !WIFEXITED(status)) return -1;
  return WEXITSTATUS(status);
}

using Concurrency = ContractTest;
using Crash = ContractTest;

TEST_F(Concurrency, OneOfSeveralProcessesMakesAGroupAndTheOthersAreToldThatItExists) {
  const int64_t parent = idOf("host/opt");
  for (int round = 0; round < 20; ++round) {
    std::vector<pid_t> pids;
    const std::string name = "pool" + std::to_string(round);
    for (int i = 0; i < kProcesses; ++i) {
      pids.push_back(startProcess([&] {
        const auto made = create(parent, name);
        return made.status == kSuccess ? 1 : made.status == kExists ? 0 : 100;
      }));
    }
    int made = 0;
    for (const pid_t pid : pids) made += exitStatusOf(pid);
    EXPECT_EQ(made, 1);
  }
}

TEST_F(Concurrency, NoReservationIsLostOrGivenTwice) {
  // Each process takes one MB at a time from a parent that has 100 of them, and counts its luck.
  const int64_t parent = newGroup("host/opt", "parent");
  ASSERT_EQ(setMemory(parent, {"minLimit=100"}), kSuccess);
  std::vector<pid_t> pids;
  for (int i = 0; i < kProcesses; ++i) {
    pids.push_back(startProcess([&, i] {
      int taken = 0;
      for (int k = 0; k < 60; ++k) {
        const auto made = create(parent, std::to_string(i) + "-" + std::to_string(k));
        if (made.status != kSuccess) return 255;
        const auto status = setMemory(made.value, {"min=1"});
        if (status != kSuccess && status != kReservationRefused) return 254;
        taken += status == kSuccess ? 1 : 0;
      }
      return taken;
    }));
  }
  int taken = 0;
  for (const pid_t pid : pids) taken += exitStatusOf(pid);
  EXPECT_EQ(taken, 100);
  EXPECT_EQ(countChildGroups(parent).value, kProcesses * 60);
  EXPECT_EQ(peaks(parent).value.childrenKB, 100U * 1024);
}

TEST_F(Concurrency, ProcessesThatMakeAndDeleteTheSameNamesLeaveGoodBooks) {
  const int64_t parent = idOf("host/opt");
  std::vector<pid_t> pids;
  for (int i = 0; i < kProcesses; ++i) {
    pids.push_back(startProcess([&] {
      for (int k = 0; k < 150; ++k) {
        const std::string name = "pool" + std::to_string(k % 3);
        const auto made = create(parent, name);
        if (made.status != kSuccess && made.status != kExists) return 1;
        const auto found = lookUp("host/opt/" + name);
        if (found.status == kNotFound) continue;  // another process was faster
        if (found.status != kSuccess) return 2;
        const auto set = setMemory(found.value, {"min=7", "max=70"});
        if (set != kSuccess && set != kNotFound) return 3;
        const auto removed = remove(found.value);
        if (removed != kSuccess && removed != kNotFound) return 4;
      }
      return 0;
    }));
  }
  for (const pid_t pid : pids) EXPECT_EQ(exitStatusOf(pid), 0);
  EXPECT_EQ(countChildGroups(parent).value, 0);
  EXPECT_EQ(setMemory(newGroup("host/opt", "all"), {"min=" + std::to_string(kMemoryMB)}), kSuccess);
}

TEST_F(Concurrency, AProcessSeesAtOnceWhatAnotherDid) {
  const int64_t parent = idOf("host/opt");
  ASSERT_EQ(countChildGroups(parent).value, 0);
  EXPECT_EQ(
      exitStatusOf(startProcess([&] { return create(parent, "pool").status == kSuccess ? 0 : 1; })),
      0);
  EXPECT_EQ(lookUp("host/opt/pool").status, kSuccess);
}

TEST_F(Concurrency, AForkedProcessGoesOnByItselfAndSoDoesItsParent) {
  const int64_t parent = idOf("host/opt");
  for (int round = 0; round < 10; ++round) {
    const pid_t pid = startProcess([&] {
      for (int k = 0; k < 50; ++k) {
        if (create(parent, "child" + std::to_string(round * 50 + k)).status != kSuccess) return 1;
      }
      return 0;
    });
    for (int k = 0; k < 50; ++k) {
      ASSERT_EQ(create(parent, "parent" + std::to_string(round * 50 + k)).status, kSuccess);
    }
    EXPECT_EQ(exitStatusOf(pid), 0);
  }
  EXPECT_EQ(countChildGroups(parent).value, 1000);
}

TEST_F(Concurrency, ThreadsOfOneProcessTakeTurns) {
  const int64_t parent = idOf("host/opt");
  std::vector<std::thread> threads;
  for (int i = 0; i < kProcesses; ++i) {
    threads.emplace_back([=] {
      for (int k = 0; k < 50; ++k) {
        const auto made = create(parent, std::to_string(i) + "-" + std::to_string(k));
        EXPECT_EQ(made.status, kSuccess);
        EXPECT_EQ(setMemory(made.value, {"min=1"}), kSuccess);
      }
    });
  }
  for (std::thread &thread : threads) thread.join();
  EXPECT_EQ(countChildGroups(parent).value, kProcesses * 50);
  EXPECT_EQ(peaks(parent).value.childrenKB, uint64_t{kProcesses} * 50 * 1024);
}

// Makes, sizes and deletes groups without an end.
[[noreturn]] void workUntilKilled(int64_t parent) {
  for (int k = 0;; ++k) {
    const auto made = create(parent, "pool" + std::to_string(k % 7));
    if (made.status == kSuccess) {
      (void)setMemory(made.value, {"min=100", "max=200"});
      (void)setCpu(made.value, {"min=10"});
      if (k % 2 == 0) (void)remove(made.value);
    } else {
      (void)remove(lookUp("host/opt/parent/pool" + std::to_string(k % 7)).value);
    }
  }
}

TEST_F(Crash, AKilledProcessLeavesATreeThatTheNextOneCanUse) {
  const int64_t parent = newGroup("host/opt", "parent");
  for (int round = 0; round < 30; ++round) {
    const pid_t pid = startProcess([&]() -> int { workUntilKilled(parent); });
    std::this_thread::sleep_for(std::chrono::microseconds(1500 + 337 * round));
    ::kill(pid, SIGKILL);
    ASSERT_EQ(exitStatusOf(pid), -1);

    const auto made = create(parent, "next");
    ASSERT_EQ(made.status, kSuccess) << round;
    EXPECT_EQ(setMemory(made.value, {"min=1"}), kSuccess);
    EXPECT_EQ(remove(made.value), kSuccess);
    // Too much may stay reserved, which the check repairs; after that it finds nothing.
    (void)kernelUnderTest().check(true);
    EXPECT_TRUE(kernelUnderTest().check(false).empty()) << round;
  }
}

TEST_F(Crash, SeveralProcessesKilledAtOnceLeaveATreeThatCanBeEmptied) {
  const int64_t parent = newGroup("host/opt", "parent");
  for (int round = 0; round < 8; ++round) {
    std::vector<pid_t> pids;
    for (int i = 0; i < kProcesses; ++i) {
      pids.push_back(startProcess([&]() -> int { workUntilKilled(parent); }));
    }
    std::this_thread::sleep_for(std::chrono::milliseconds(8 + round));
    for (const pid_t pid : pids) ::kill(pid, SIGKILL);
    for (const pid_t pid : pids) ASSERT_EQ(exitStatusOf(pid), -1);
  }
  (void)kernelUnderTest().check(true);
  for (int k = 0; k < 7; ++k) {
    const auto left = lookUp("host/opt/parent/pool" + std::to_string(k));
    if (left.status != kSuccess) continue;
    EXPECT_EQ(remove(left.value), kSuccess);
  }
  EXPECT_EQ(remove(parent), kSuccess);
  EXPECT_EQ(setMemory(newGroup("host/opt", "all"), {"min=" + std::to_string(kMemoryMB)}), kSuccess);
}

}  // namespace
}  // namespace Contract
