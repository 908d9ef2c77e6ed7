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

  // How long the command takes when nobody kills it.
  microseconds durationOf(const std::string &command) {
    const auto begin = Clock::now();
    EXPECT_EQ(waitFor(start(command)), 0) << command;
    return std::chrono::duration_cast<microseconds>(Clock::now() - begin);
  }

  // Nobody may be promised more than those above him have been given for it, at no moment.
  static void expectEveryPromiseCovered() {
    for (const std::string &group : allGroups()) {
      int64_t below = 0;
      for (const std::string &other : allGroups())
        if (other.rfind('/') == group.size() && other.compare(0, group.size(), group) == 0)
          below += numberIn(other, "memory.min");
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
        const bool hasMemory = numberIn(group, "memory.max") == pool->second.memMax * kMiB ||
                               numberIn(group, "memory.min") != 0;
        numbers = pool->second;
        if (!hasMemory) numbers.memMin = 0;
      }
      there[group] = numbers;
    }
    for (const auto &[group, files] : expectedFiles(there, 1))
      EXPECT_EQ(numberIn(group, "memory.min"), std::stoll(files.substr(files.find(": ") + 2)))
          << group;
  }

  // What people do after a crash.
  void expectMended() {
    expectEveryPromiseCovered();
    const ::Test::ProcessResult check = world.run("knobctl", {"check", "--repair"});
    EXPECT_EQ(check.status, 0) << check.out << check.err;
    const ::Test::ProcessResult again = world.run("knobctl", {"check"});
    EXPECT_EQ(again.status, 0) << again.out << again.err;
    const ::Test::ProcessResult loaded = world.poolctl({"load", "-q", file_});
    EXPECT_TRUE(silentlyDone(loaded));
    for (const auto &[name, pool] : pools_) EXPECT_TRUE(groupExists(name)) << name;
    EXPECT_TRUE(silentlyDone(world.poolctl({"unload", file_})));
    expectNothingLeft();
  }

  static void expectNothingLeft() {
    EXPECT_EQ(allGroups(), kFixedGroups);
    for (const std::string &group : kFixedGroups)
      EXPECT_EQ(actualFiles(group),
                "memory.min: 0\nmemory.max: max\ncpu.max: max 100000\ncpu.weight: 100\n");
  }

  std::string file_;
  Pools pools_;
};

TEST_F(Crash, AKillAtAnyMomentOfLoadAndUnloadLeavesATreeThatTheNextCanUse) {
  durationOf("load");
  durationOf("unload");
  const microseconds reading = durationOf("list");
  const microseconds load = durationOf("load"), unload = durationOf("unload");
  std::mt19937 random(kSeed);
  int killed = 0, halfDone = 0;
  for (int i = 0; i < kKills && !HasFailure(); ++i) {
    const bool loading = i % 2 == 0;
    if (!loading) {
      ASSERT_TRUE(silentlyDone(world.poolctl({"load", file_})));
    }
    // Seldom while the definitions are still read, and mostly while the kernel is at work.
    const auto first = static_cast<unsigned>(i % 10 < 2 ? 0 : reading.count() * 3 / 4);
    const auto last = static_cast<unsigned>((loading ? load : unload).count());
    const microseconds moment(first + random() % (std::max(last, first) - first + 1));
    SCOPED_TRACE((loading ? "load" : "unload") + std::string(", killed after ") +
                 std::to_string(moment.count()) + " us");
    const pid_t pid = start(loading ? "load" : "unload");
    std::this_thread::sleep_for(moment);
    kill(pid, SIGKILL);
    if (WIFSIGNALED(waitFor(pid))) ++killed;
    const size_t groups = allGroups().size();
    if (groups > kFixedGroups.size() && groups < kFixedGroups.size() + pools_.size()) ++halfDone;
    expectMended();
  }
  RecordProperty("killed", killed);
  RecordProperty("half done", halfDone);
  std::cout << kKills << " kills: " << killed << " hit a living process, " << halfDone
            << " a half-made tree\n";
  EXPECT_GT(killed, kKills / 2);
  EXPECT_GT(halfDone, kKills / 20);
}

TEST_F(Crash, FourAtOnceForTwentySecondsLeaveATreeThatTheNextCanUse) {
  const auto end = Clock::now() + std::chrono::seconds(20);
  std::vector<std::thread> workers;
  std::atomic<int> runs{0}, loads{0}, crashes{0};
  for (int i = 0; i < 4; ++i)
    workers.emplace_back([&] {
      while (Clock::now() < end)
        for (const char *command : {"load", "unload"}) {
          const int status = waitFor(start(command));
          ++runs;
          if (!WIFEXITED(status) || WEXITSTATUS(status) > 1) ++crashes;
          if (status == 0 && command[0] == 'l') ++loads;
        }
    });
  for (std::thread &worker : workers) worker.join();
  std::cout << runs << " runs, " << loads << " complete loads\n";
  EXPECT_EQ(crashes, 0);
  EXPECT_GT(loads, 0);
  expectMended();
}

}  // namespace
}  // namespace Uml
