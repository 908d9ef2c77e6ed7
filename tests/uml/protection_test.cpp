// SPDX-License-Identifier: Apache-2.0
// What a memory minimum is for: a pool keeps it when the machine is short of memory. The files are
// sparse, so that reading them fills the page cache at once and needs no disk.
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/sysinfo.h>

#include <filesystem>
#include <fstream>

#include "linux_world.h"

namespace Uml {
namespace {

constexpr int64_t kMinimumMB = 64;

int64_t machineMB() {
  struct sysinfo info;
  sysinfo(&info);
  return static_cast<int64_t>(info.totalram * info.mem_unit / kMiB);
}

class Protection : public LinuxTest {
 protected:
  std::filesystem::path fileOfMB(const std::string &name, int64_t megabytes) {
    const std::filesystem::path path = world.folder() / name;
    std::ofstream(path).close();
    std::filesystem::resize_file(path, static_cast<uintmax_t>(megabytes * kMiB));
    return path;
  }

  // What is left in memory of a group that had more than its minimum there, in MB, once a
  // neighbour has read four times the machine's memory.
  double leftBesideGreedyNeighbour(const std::string &group, const std::string &neighbour) {
    writeFileOnce("/proc/sys/vm/drop_caches", "3");
    Worker first(group, readThrough(fileOfMB("own", kMinimumMB + 16)));
    EXPECT_TRUE(first.waitUntilDone());
    EXPECT_GE(numberIn(group, "memory.current"), kMinimumMB * kMiB);
    Worker second(neighbour, readThrough(fileOfMB("other", 2 * machineMB()), 2));
    EXPECT_TRUE(second.waitUntilDone());
    EXPECT_TRUE(first.alive() && second.alive());
    EXPECT_EQ(oomKills(), 0);
    return static_cast<double>(numberIn(group, "memory.current")) / static_cast<double>(kMiB);
  }

 private:
  static void writeFileOnce(const char *path, const char *text) { std::ofstream(path) << text; }
};

TEST_F(Protection, APoolKeepsItsMinimumBesideANeighbourThatReadsEverything) {
  ASSERT_TRUE(silentlyDone(load("- name: kept\n  memMin: 64\n- name: greedy\n")));
  EXPECT_GE(leftBesideGreedyNeighbour("host/opt/kept", "host/opt/greedy"), 0.95 * kMinimumMB);
}

TEST_F(Protection, WithoutAMinimumThePoolLosesMostOfIt) {
  ASSERT_TRUE(silentlyDone(load("- name: kept\n- name: greedy\n")));
  EXPECT_LT(leftBesideGreedyNeighbour("host/opt/kept", "host/opt/greedy"), 0.5 * kMinimumMB);
}

TEST_F(Protection, AMinimumHoldsBelowParentsThatHaveNoneOfTheirOwn) {
  ASSERT_TRUE(
      silentlyDone(load("- name: a\n- name: a/b\n- name: a/b/kept\n  memMin: 64\n"
                        "- name: greedy\n")));
  EXPECT_GE(leftBesideGreedyNeighbour("host/opt/a/b/kept", "host/opt/greedy"), 0.95 * kMinimumMB);
}

TEST_F(Protection, ASiblingUnderTheSameParentCannotTakeItEither) {
  ASSERT_TRUE(silentlyDone(
      load("- name: a\n  memMin: 64\n- name: a/kept\n  memMin: 64\n- name: a/greedy\n")));
  EXPECT_GE(leftBesideGreedyNeighbour("host/opt/a/kept", "host/opt/a/greedy"), 0.95 * kMinimumMB);
}

TEST_F(Protection, APoolThatWasDisabledAndEnabledKeepsItsMinimumAgain) {
  world.definition("pools.yaml", "- name: kept\n  memMin: 64\n- name: greedy\n");
  ASSERT_TRUE(silentlyDone(world.poolctl({"load"})));
  ASSERT_TRUE(silentlyDone(world.poolctl({"disable", "-n", "host/opt/kept"})));
  EXPECT_EQ(numberIn("host", "memory.min"), 0);
  ASSERT_TRUE(silentlyDone(world.poolctl({"enable", "host/opt/kept"})));
  EXPECT_GE(leftBesideGreedyNeighbour("host/opt/kept", "host/opt/greedy"), 0.95 * kMinimumMB);
}

// systemd mounts cgroup2 with it, and so does the machine of these tests.
TEST_F(Protection, AMinimumProtectsChildPoolsOnlyWithRecursiveProtection) {
  const auto remount = [](const char *option) {
    return mount("none", kMount.c_str(), "cgroup2", MS_REMOUNT, option);
  };
  ASSERT_TRUE(silentlyDone(load("- name: a\n  memMin: 64\n- name: a/b\n- name: greedy\n")));
  EXPECT_EQ(world.run("knobctl", {"check"}).status, 0);
  EXPECT_GE(leftBesideGreedyNeighbour("host/opt/a/b", "host/opt/greedy"), 0.95 * kMinimumMB);
  ASSERT_EQ(remount(""), 0);
  EXPECT_EQ(world.run("knobctl", {"check"}).status, 1);
  EXPECT_LT(leftBesideGreedyNeighbour("host/opt/a/b", "host/opt/greedy"), 0.5 * kMinimumMB);
  EXPECT_EQ(remount("memory_recursiveprot"), 0);
}

// What Linux itself makes of some settings. A parent has memory of its own: the page cache of a
// deleted pool, and what the kernel needs for the groups below it, which is more on more CPUs.
// Where the pools below may have all that the parent may have, the parent's maximum is reached
// first; where all of that is protected, the kernel cannot reclaim anything, and kills.
class TightParent : public Protection {
 protected:
  // Reads 120 MB in outer/inner, makes that pool anew, and reads as much there again. The second
  // reader is given to "expect".
  void readTwice(const std::string &outer, const std::string &inner,
                 const std::function<void(Worker &)> &expect) {
    ASSERT_TRUE(silentlyDone(world.poolctl({"load", world.file("outer.yaml", outer)})));
    const std::string file = world.file("inner.yaml", inner);
    ASSERT_TRUE(silentlyDone(world.poolctl({"load", file})));
    {
      Worker before("host/opt/outer/inner", readThrough(fileOfMB("before", 120)));
      before.waitUntilDone();
    }
    ASSERT_TRUE(silentlyDone(world.poolctl({"unload", file})));
    ASSERT_TRUE(silentlyDone(world.poolctl({"load", file})));
    Worker after("host/opt/outer/inner", readThrough(fileOfMB("after", 120)));
    expect(after);
  }

  void readTwiceAndLive(const std::string &outer, const std::string &inner) {
    readTwice(outer, inner, [](Worker &reader) {
      EXPECT_TRUE(reader.waitUntilDone());
      EXPECT_TRUE(reader.alive());
      EXPECT_EQ(numberIn("host/opt/outer", "memory.events", "oom_kill"), 0);
    });
  }
};

// User-mode Linux 6.1 kills the second reader alone, machines with several CPUs the first one too.
TEST_F(TightParent, AMinimumAsLargeAsTheMaximumUnderAParentOfThatSizeGetsAReaderKilled) {
  readTwice("- name: outer\n  mem: 80\n", "- name: outer/inner\n  mem: 80\n", [](Worker &reader) {
    EXPECT_FALSE(reader.waitUntilDone());
    EXPECT_GE(numberIn("host/opt/outer", "memory.events", "oom_kill"), 1);
  });
}

TEST_F(TightParent, WithAMinimumBelowTheMaximumTheSameReaderLives) {
  readTwiceAndLive("- name: outer\n  mem: 80\n",
                   "- name: outer/inner\n  memMin: 64\n  memMax: 80\n");
}

}  // namespace
}  // namespace Uml
