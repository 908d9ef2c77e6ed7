// SPDX-License-Identifier: Apache-2.0
// Processes that are killed in the middle of their work, and many that work at once: the tree that
// they leave is one that the next can use.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdlib>
#include <iostream>
#include <random>
#include <system_error>
#include <thread>

#include "expected_files.h"
#include "linux_world.h"

namespace Uml {
namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::microseconds;

constexpr int kKills = 200;
constexpr unsigned kSeed = 20261;

// Three levels, minima at all of them, and parents that keep more than those below need.
constexpr const char *kDefinition =
    "- name: a\n  memMin: 40\n  memMax: 200\n  cpuMin: 8\n"
    "- name: a/b\n  memMin: 8\n  cpuMin: 3\n"
    "- name: a/b/x\n  mem: 6\n- name: a/b/y\n  mem: 5\n  cpuMax: 40\n"
    "- name: a/c\n  memMin: 16\n  memMinLimit: 20\n"
    "- name: d\n  memMax: 90\n- name: d/e\n  mem: 12\n  cpuMin: 2\n- name: d/f\n  mem: 30\n"
    "- name: host/g\n  memMin: 7\n  memShares: 300\n";

// Enough for the kernel to take about as long as reading them.
std::string definition() {
  std::string text = kDefinition;
  for (int i = 0; i < 24; ++i)
    text += "- name: d/f/n" + std::to_string(i) + "\n  memMin: " + std::to_string(i % 3) + "\n";
  return text;
}

class Crash : public LinuxTest {
 protected:
  Crash() : file_(world.file("pools.yaml", definition()).string()) {
    pools_ = parseList(world.poolctl({"list", "-v", file_}).out);
  }

  pid_t start(const std::string &command) {
    std::vector<std::string> environment;
    for (const auto &[name, value] : world.environment) environment.push_back(name + "=" + value);
    std::vector<char *> envp;
    for (std::string &text : environment) envp.push_back(text.data());
    envp.push_back(nullptr);
    const std::string program = (::Test::binFolder() / "poolctl").string();
    const char *argv[] = {"poolctl", command.c_str(), file_.c_str(), nullptr};
    posix_spawn_file_actions_t files;
    posix_spawn_file_actions_init(&files);
    for (int stream : {STDOUT_FILENO, STDERR_FILENO})
      posix_spawn_file_actions_addopen(&files, stream, "/dev/null", O_WRONLY, 0);
    pid_t pid = -1;
    const int error = posix_spawn(&pid, program.c_str(), &files, nullptr,
                                  const_cast<char *const *>(argv), envp.data());
    posix_spawn_file_actions_destroy(&files);
    if (error != 0) throw std::system_error(error, std::generic_category(), program);
    return pid;
  }

  static int waitFor(pid_t pid) {
    int status = -1;
    waitpid(pid, &status, 0);
    return status;
  }

  // Waits until so many groups have been made or deleted since, or the process has ended.
  static void waitForProgress(pid_t pid, int64_t before, int64_t groups) {
    siginfo_t info{};
    while (std::abs(numberOfGroups() - before) < groups) {
      if (waitid(P_PID, static_cast<id_t>(pid), &info, WEXITED | WNOHANG | WNOWAIT) != 0) return;
      if (info.si_pid == pid) return;
      std::this_thread::sleep_for(microseconds(100));
    }
  }

  static int64_t numberOfGroups() {
    return groupExists("host") ? numberIn("host", "cgroup.stat", "nr_descendants") : 0;
  }

  // Nobody may be promised more than those above him have been given for it, at no moment.
  static void expectEveryPromiseCovered() {
    for (const std::string &group : allGroups()) {
      int64_t below = 0;
      for (const std::string &other : allGroups()) {
        if (other.rfind('/') == group.size() && other.compare(0, group.size(), group) == 0)
          below += numberIn(other, "memory.min");
      }
      EXPECT_GE(numberIn(group, "memory.min"), below) << group;
    }
  }

  // Each group has what its definition says, or nothing yet; its parents have exactly the sums.
  void expectSumsRight() {
    Pools there;
    for (const std::string &group : allGroups()) {
      const auto pool = pools_.find(group);
      PoolNumbers numbers;
      numbers.cpuShares = -3;
      if (pool != pools_.end()) {
        // A group that was there when a later load came has kept what it had: nothing.
        const int64_t max = pool->second.memMax;
        const bool hasMemory = max == -1 ? numberIn(group, "memory.min") != 0
                                         : numberIn(group, "memory.max") == max * kMiB;
        numbers = pool->second;
        if (!hasMemory) numbers.memMin = 0;
      }
      there[group] = numbers;
    }
    for (const auto &[group, files] : expectedFiles(there, 1)) {
      EXPECT_EQ(numberIn(group, "memory.min"), std::stoll(files.substr(files.find(": ") + 2)))
          << group;
    }
  }

  // What people do after a crash. All pools are loaded then.
  void expectMended() {
    expectEveryPromiseCovered();
    const ::Test::ProcessResult check = world.run("knobctl", {"check", "--repair"});
    EXPECT_EQ(check.status, 0) << check.out << check.err;
    expectSumsRight();
    EXPECT_TRUE(silentlyDone(world.poolctl({"load", "-q", file_})));
    for (const auto &[name, pool] : pools_) EXPECT_TRUE(groupExists(name)) << name;
  }

  void expectUnloadLeavesNothing() {
    EXPECT_TRUE(silentlyDone(world.poolctl({"unload", file_})));
    expectNothingLeft();
  }

  static void expectNothingLeft() {
    EXPECT_EQ(allGroups(), kFixedGroups);
    for (const std::string &group : kFixedGroups) {
      EXPECT_EQ(actualFiles(group),
                "memory.min: 0\nmemory.max: max\ncpu.max: max 100000\ncpu.weight: 100\n");
    }
  }

  std::string file_;
  Pools pools_;
};

TEST_F(Crash, AKillAtAnyMomentOfLoadAndUnloadLeavesATreeThatTheNextCanUse) {
  std::mt19937 random(kSeed);
  int killed = 0, halfDone = 0;
  for (int i = 0; i < kKills && !HasFailure(); ++i) {
    const bool loading = i % 2 == 0;
    // A random number of groups, and then some moment of the work on the next.
    const auto groups = static_cast<int64_t>(random() % pools_.size());
    const microseconds more(random() % 3000);
    SCOPED_TRACE((loading ? "load" : "unload") + std::string(", killed after ") +
                 std::to_string(groups) + " groups and " + std::to_string(more.count()) + " us");
    const int64_t before = numberOfGroups();
    const pid_t pid = start(loading ? "load" : "unload");
    waitForProgress(pid, before, groups);
    std::this_thread::sleep_for(more);
    kill(pid, SIGKILL);
    if (WIFSIGNALED(waitFor(pid))) ++killed;
    const size_t there = allGroups().size();
    if (there > kFixedGroups.size() && there < kFixedGroups.size() + pools_.size()) ++halfDone;
    expectMended();
    if (!loading) expectUnloadLeavesNothing();
  }
  std::cout << kKills << " kills: " << killed << " hit a living process, " << halfDone
            << " left a part of the groups\n";
  EXPECT_GT(killed, kKills / 2);
  EXPECT_GT(halfDone, kKills / 4);
}

TEST_F(Crash, FourAtOnceForTwentySecondsLeaveATreeThatTheNextCanUse) {
  const auto end = Clock::now() + std::chrono::seconds(20);
  std::vector<std::thread> workers;
  std::atomic<int> runs{0}, loads{0}, crashes{0};
  for (int i = 0; i < 4; ++i) {
    workers.emplace_back([&] {
      while (Clock::now() < end) {
        for (const char *command : {"load", "unload"}) {
          const int status = waitFor(start(command));
          ++runs;
          if (!WIFEXITED(status) || WEXITSTATUS(status) > 1) ++crashes;
          if (status == 0 && command[0] == 'l') ++loads;
        }
      }
    });
  }
  for (std::thread &worker : workers) worker.join();
  std::cout << runs << " runs, " << loads << " complete loads\n";
  EXPECT_EQ(crashes, 0);
  EXPECT_GT(loads, 0);
  expectMended();
  EXPECT_EQ(world.run("knobctl", {"check"}).status, 0);
  expectUnloadLeavesNothing();
}

}  // namespace
}  // namespace Uml
