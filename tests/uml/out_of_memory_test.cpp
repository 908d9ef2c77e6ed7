// SPDX-License-Identifier: Apache-2.0
// What a memory minimum is worth when the whole machine is out of memory.
#include <gtest/gtest.h>
#include <sys/sysinfo.h>

#include <fstream>
#include <memory>
#include <vector>

#include "linux_world.h"

namespace Uml {
namespace {

// The value that a process gets in a pool with that minimum.
int expectedAdj(int64_t minMB) {
  struct sysinfo info;
  sysinfo(&info);
  const auto machineMB =
      static_cast<int64_t>((info.totalram + info.totalswap) * info.mem_unit / kMiB);
  return static_cast<int>(-((1000 * minMB + machineMB - 1) / machineMB));
}

int adjOf(pid_t pid) {
  std::ifstream file("/proc/" + std::to_string(pid) + "/oom_score_adj");
  int value = 1;
  file >> value;
  return value;
}

class OutOfMemory : public LinuxTest {
 protected:
  ::Test::ProcessResult exec(const ::Test::Arguments &arguments) {
    return world.run("poolctl-exec", arguments);
  }
};

TEST_F(OutOfMemory, APoolsCommandAndItsChildrenAreProtected) {
  ASSERT_TRUE(silentlyDone(load("- name: web\n  memMin: 120\n- name: other\n")));
  const std::string expected = std::to_string(expectedAdj(120)) + "\n";
  EXPECT_EQ(exec({"web", "--", "cat", "/proc/self/oom_score_adj"}).out, expected);
  EXPECT_EQ(exec({"web", "--", "sh", "-c", "cat /proc/self/oom_score_adj; true"}).out, expected);
  EXPECT_EQ(exec({"other", "--", "cat", "/proc/self/oom_score_adj"}).out, "0\n");
}

TEST_F(OutOfMemory, AValueThatTheCallerChoseIsKept) {
  ASSERT_TRUE(silentlyDone(load("- name: web\n  memMin: 120\n")));
  const std::string command = "poolctl-exec web -- cat /proc/self/oom_score_adj";
  EXPECT_EQ(world.run("/bin/sh", {"-c", "echo 300 >/proc/self/oom_score_adj; exec " + command}).out,
            "300\n");
}

TEST_F(OutOfMemory, AnOptionChoosesAnotherValue) {
  ASSERT_TRUE(silentlyDone(load("- name: web\n  memMin: 120\n")));
  for (const char *value : {"-1000", "0", "1000"}) {
    EXPECT_EQ(exec({"--oom-score-adj", value, "web", "--", "cat", "/proc/self/oom_score_adj"}).out,
              std::string(value) + "\n");
  }
  EXPECT_EQ(exec({"--oom-score-adj", "1001", "web", "--", "true"}).status, 125);
}

// Takes more and more memory, until something is killed for it.
void takeAll() {
  for (;;) holdMB(4)();
}

class Storm : public OutOfMemory {
 protected:
  Storm() {
    std::filesystem::create_directory(kMount / "hogs");
    std::filesystem::create_directory(kMount / "neighbours");
    for (int i = 0; i < 16; ++i) {
      neighbours_.push_back(std::make_unique<Worker>("neighbours", holdMB(2)));
      EXPECT_TRUE(neighbours_.back()->waitUntilDone());
    }
  }

  // The machine runs out of memory that often, and each time the hog is killed.
  void fillTheMachine(int times) {
    for (int i = 0; i < times; ++i) {
      Worker hog("hogs", takeAll);
      EXPECT_FALSE(hog.waitUntilDone());
    }
    EXPECT_EQ(numberIn("hogs", "memory.events.local", "oom_kill"), times);
  }

  std::vector<std::unique_ptr<Worker>> neighbours_;
};

TEST_F(Storm, WithoutAMinimumTheDaemonDies) {
  ASSERT_TRUE(silentlyDone(load("- name: web\n")));
  Worker daemon("host/opt/web", holdMB(100));
  ASSERT_TRUE(daemon.waitUntilDone());
  Worker hog("hogs", takeAll);
  EXPECT_FALSE(hog.waitUntilDone());
  EXPECT_FALSE(daemon.alive());
}

TEST_F(Storm, ADaemonWithinItsMinimumLives) {
  ASSERT_TRUE(silentlyDone(load("- name: web\n  memMin: 120\n")));
  Worker daemon("host/opt/web", holdMB(100));
  ASSERT_TRUE(daemon.waitUntilDone());
  const std::string pid = std::to_string(daemon.pid());
  ASSERT_TRUE(silentlyDone(world.run("knobctl", {"join", "host/opt/web", pid})));
  ASSERT_EQ(adjOf(daemon.pid()), expectedAdj(120));
  fillTheMachine(5);
  EXPECT_TRUE(daemon.alive());
}

TEST_F(Storm, ADaemonThatAnotherProgramMovedInLivesAfterRepair) {
  ASSERT_TRUE(silentlyDone(load("- name: web\n  memMin: 120\n")));
  Worker daemon("host/opt/web", holdMB(100));
  ASSERT_TRUE(daemon.waitUntilDone());
  const ::Test::ProcessResult check = world.run("knobctl", {"check"});
  EXPECT_EQ(check.status, 1);
  EXPECT_EQ(check.out, "host/opt/web: 1 of its processes lack the oom_score_adj of " +
                           std::to_string(expectedAdj(120)) + " that its minimum asks for\n");
  EXPECT_EQ(world.run("knobctl", {"check", "--repair"}).status, 0);
  EXPECT_EQ(world.run("knobctl", {"check"}).status, 0);
  fillTheMachine(5);
  EXPECT_TRUE(daemon.alive());
}

TEST_F(Storm, AProcessFarBeyondItsMinimumIsTheOneThatDies) {
  ASSERT_TRUE(silentlyDone(load("- name: web\n  memMin: 20\n")));
  Worker greedy("host/opt/web", holdMB(150));
  ASSERT_TRUE(greedy.waitUntilDone());
  ASSERT_EQ(world.run("knobctl", {"check", "--repair"}).status, 0);
  Worker other("hogs", holdMB(80));
  EXPECT_TRUE(other.waitUntilDone());
  EXPECT_TRUE(other.alive());
  EXPECT_FALSE(greedy.alive());
}

}  // namespace
}  // namespace Uml
