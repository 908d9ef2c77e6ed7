// SPDX-License-Identifier: Apache-2.0
// poolctl-exec on the Linux kernel: the command is in the pool's group, and nothing else is.
#include <gtest/gtest.h>
#include <signal.h>

#include "linux_world.h"

namespace Uml {
namespace {

class ExecInPool : public LinuxTest {
 protected:
  ::Test::ProcessResult exec(const ::Test::Arguments &arguments) {
    return world.run("poolctl-exec", arguments);
  }
};

TEST_F(ExecInPool, TheCommandAndItsChildrenAreInThePool) {
  ASSERT_TRUE(silentlyDone(load("- name: web\n")));
  EXPECT_EQ(exec({"web", "--", "cat", "/proc/self/cgroup"}).out, "0::/host/opt/web\n");
  EXPECT_EQ(exec({"web", "--", "/bin/sh", "-c", "cat /proc/self/cgroup; exit 3"}).status, 3);
  EXPECT_EQ(exec({"web", "--", "/bin/sh", "-c", "cat /proc/self/cgroup; exit 3"}).out,
            "0::/host/opt/web\n");
}

TEST_F(ExecInPool, TheCommandIsTheOnlyProcessThere) {
  ASSERT_TRUE(silentlyDone(load("- name: web\n")));
  const ::Test::ProcessResult result =
      world.run("/bin/sh", {"-c",
                            "echo $$; exec poolctl-exec web -- cat /sys/fs/cgroup/host/opt/web/"
                            "cgroup.procs"});
  const auto pids = ::Test::lines(result.out);
  ASSERT_EQ(pids.size(), 2u) << result.out << result.err;
  EXPECT_EQ(pids[0], pids[1]);
}

TEST_F(ExecInPool, AMaximumHoldsForTheCommand) {
  ASSERT_TRUE(silentlyDone(load("- name: small\n  memMax: 16\n")));
  const ::Test::ProcessResult result =
      exec({"small", "--", "/bin/sh", "-c", "head -c 67108864 /dev/zero | tail -c 60000000 >&2"});
  EXPECT_NE(result.status, 0);
  EXPECT_GE(numberIn("host/opt/small", "memory.events", "oom_kill"), 1);
  EXPECT_LE(numberIn("host/opt/small", "memory.current"), 16 * kMiB);
}

TEST_F(ExecInPool, APoolInUseIsBusyUntilItsCommandEnds) {
  ASSERT_TRUE(silentlyDone(load("- name: web\n")));
  const ::Test::ProcessResult result = exec(
      {"web", "--", "/bin/sh", "-c", "poolctl unload " + (world.folder() / "pools.yaml").string()});
  EXPECT_EQ(result.status, 1);
  EXPECT_NE(result.err.find("busy"), std::string::npos) << result.err;
  EXPECT_TRUE(silentlyDone(world.poolctl({"disable", "-w", "5", "host/opt/web"})));
}

TEST_F(ExecInPool, APoolWithPoolsBelowTakesNoProcesses) {
  ASSERT_TRUE(silentlyDone(load("- name: a\n- name: a/b\n")));
  const ::Test::ProcessResult result = exec({"a", "--", "true"});
  EXPECT_EQ(result.status, 125);
  EXPECT_EQ(result.err,
            "poolctl-exec: host/opt/a: the pool has pools below it, so it takes no "
            "processes itself\n");
  EXPECT_EQ(exec({"a/b", "--", "true"}).status, 0);
}

TEST_F(ExecInPool, ADisabledPoolTakesNoProcessesAndKillsNone) {
  ASSERT_TRUE(silentlyDone(load("- name: web\n")));
  ASSERT_TRUE(silentlyDone(world.poolctl({"disable", "-n", "host/opt/web"})));
  const ::Test::ProcessResult result = exec({"web", "--", "true"});
  EXPECT_EQ(result.status, 125);
  EXPECT_EQ(result.err, "poolctl-exec: host/opt/web: the pool is disabled\n");
  EXPECT_EQ(oomKills(), 0);
}

TEST_F(ExecInPool, APoolThatIsNotLoadedIsSaidSo) {
  const ::Test::ProcessResult result = exec({"none", "--", "true"});
  EXPECT_EQ(result.status, 125);
  EXPECT_EQ(result.err, "poolctl-exec: host/opt/none: no such pool is loaded\n");
}

TEST_F(ExecInPool, StatusesOfACommandThatCannotBeRunAreThoseOfAShell) {
  ASSERT_TRUE(silentlyDone(load("- name: web\n")));
  EXPECT_EQ(exec({"web", "--", "no-such-command"}).status, 127);
  EXPECT_EQ(exec({"web", "--", "/etc"}).status, 126);
  EXPECT_TRUE(silentlyDone(world.poolctl({"disable", "-w", "5", "host/opt/web"})));
}

TEST_F(ExecInPool, WithoutTheRightToMoveProcessesItSaysSo) {
  ASSERT_TRUE(silentlyDone(load("- name: web\n")));
  const auto file = kMount / "host/opt/web/cgroup.procs";
  std::filesystem::permissions(file, std::filesystem::perms::owner_read);
  const ::Test::ProcessResult result =
      world.run("/usr/bin/setpriv",
                {"--bounding-set=-all", "--inh-caps=-all", "poolctl-exec", "web", "--", "true"});
  EXPECT_EQ(result.status, 125);
  EXPECT_EQ(result.err.rfind("poolctl-exec: host/opt/web: permission denied", 0), 0U) << result.err;
}

TEST_F(ExecInPool, AHostWithoutControlGroupsIsNotUsable) {
  const ::Test::ProcessResult result = world.run(
      "/usr/bin/unshare",
      {"--mount", "/bin/sh", "-c", "umount /sys/fs/cgroup; exec poolctl-exec web -- true"});
  EXPECT_EQ(result.status, 125);
  EXPECT_EQ(
      result.err.rfind("poolctl-exec: host/opt/web: kernel not usable (see `knobctl status`): "
                       "no cgroup2 file system is mounted",
                       0),
      0U)
      << result.err;
}

}  // namespace
}  // namespace Uml
