// SPDX-License-Identifier: Apache-2.0
// Pools on a machine whose first process is systemd, which manages the same tree of control groups
// and mounts it with memory_recursiveprot. The daemon's unit is the one of poolctl-exec(1).
#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <thread>

#include "control_files.h"
#include "world.h"

namespace Uml {
namespace {

namespace fs = std::filesystem;

const std::string kPool = "host/opt/storage/daemon";
const fs::path kUnits = "/run/systemd/system";

class SystemdFirst : public testing::Test {
 protected:
  SystemdFirst() {
    ::Test::writeFile(world.folder() / "knob.conf", "kernel = linux\n");
    const std::string pools = world.file(
        "pools.yaml",
        "- name: storage\n  memMin: 64\n- name: storage/daemon\n  memMin: 48\n  memMax: 96\n");
    const std::string bin = ::Test::binFolder().string() + "/";
    const std::string service =
        "[Service]\nEnvironment=KNOB_CONF=" + world.environment["KNOB_CONF"];
    fs::create_directories(kUnits);
    unit("poolctl-load.service", service + "\nType=oneshot\nRemainAfterExit=yes\nExecStart=" + bin +
                                     "poolctl load -q " + pools + "\nExecStop=" + bin +
                                     "poolctl unload " + pools + "\n");
    unit("storaged.service", "[Unit]\nRequires=poolctl-load.service\nAfter=poolctl-load.service\n" +
                                 service + "\nType=exec\nRestart=on-failure\nExecStart=" + bin +
                                 "poolctl-exec storage/daemon -- /bin/sleep 1000\n"
                                 "ExecStopPost=-/bin/sh -c 'echo 1 >/sys/fs/cgroup/" +
                                 kPool + "/cgroup.kill'\n");
    systemctl({"daemon-reload"});
    systemctl({"start", "storaged.service"});
    awaitDaemon();
  }

  ~SystemdFirst() override {
    systemctl({"stop", "storaged.service"});
    systemctl({"stop", "poolctl-load.service"});
  }

  std::string systemctl(const ::Test::Arguments &arguments) {
    const ::Test::ProcessResult result = world.run("/usr/bin/systemctl", arguments);
    return result.out + result.err;
  }

  // The pool has its settings and the daemon, by the kernel's own files.
  void expectThePoolAsLoaded() {
    EXPECT_EQ(numberIn(kPool, "memory.min"), 48 * kMiB);
    EXPECT_EQ(numberIn(kPool, "memory.max"), 96 * kMiB);
    EXPECT_EQ(numberIn("host/opt", "memory.min"), 64 * kMiB);
    EXPECT_EQ(numberIn("host", "memory.min"), 64 * kMiB);
    EXPECT_EQ(::Test::lines(readControl(kPool, "cgroup.procs")).size(), 1u);
    const ::Test::ProcessResult check = world.run("knobctl", {"check"});
    EXPECT_EQ(check.status, 0) << check.out << check.err;
  }

  ::Test::World world;

 private:
  // The unit counts as started once poolctl-exec runs, which then joins the pool.
  static void awaitDaemon() {
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(60);
    while (!groupExists(kPool) || readControl(kPool, "cgroup.procs").empty()) {
      ASSERT_LT(std::chrono::steady_clock::now(), end) << "the daemon does not join its pool";
      std::this_thread::sleep_for(std::chrono::milliseconds(50));
    }
  }

  static void unit(const std::string &name, const std::string &text) {
    ::Test::writeFile(kUnits / name, text);
  }
};

TEST_F(SystemdFirst, IsTheFirstProcessAndProtectsRecursively) {
  EXPECT_EQ(::Test::readFile("/proc/1/comm"), "systemd\n");
  EXPECT_NE(::Test::readFile("/proc/mounts").find("memory_recursiveprot"), std::string::npos);
  expectThePoolAsLoaded();
}

TEST_F(SystemdFirst, ReloadAndReexecLeaveThePoolAndItsDaemon) {
  systemctl({"daemon-reload"});
  expectThePoolAsLoaded();
  systemctl({"daemon-reexec"});
  expectThePoolAsLoaded();
  EXPECT_EQ(systemctl({"is-active", "storaged.service"}), "active\n");
}

TEST_F(SystemdFirst, OtherUnitsWithSettingsOfTheirOwnLeaveThePool) {
  systemctl({"set-property", "--runtime", "system.slice", "MemoryMin=16M", "CPUWeight=200"});
  expectThePoolAsLoaded();
  systemctl({"set-property", "--runtime", "system.slice", "MemoryMin=0", "CPUWeight="});
  expectThePoolAsLoaded();
}

TEST_F(SystemdFirst, StoppingTheUnitsEmptiesAndRemovesThePool) {
  systemctl({"stop", "storaged.service"});
  systemctl({"stop", "poolctl-load.service"});
  EXPECT_EQ(systemctl({"show", "-P", "Result", "poolctl-load.service"}), "success\n");
  EXPECT_FALSE(groupExists("host/opt/storage"));
  EXPECT_EQ(numberIn("host", "memory.min"), 0);
}

}  // namespace
}  // namespace Uml
