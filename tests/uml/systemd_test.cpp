// SPDX-License-Identifier: Apache-2.0
// Pools beside systemd: a systemd of the machine's own, the units of poolctl-exec(1) with other
// paths, and the kernel's files as judge of who is where.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <thread>

#include "linux_world.h"

namespace Uml {
namespace {

namespace fs = std::filesystem;

constexpr const char *kSystemd = "/lib/systemd/systemd";
const std::string kPool = "host/opt/storage/daemon";

// With a child of its own, so that one can see who ends it.
constexpr const char *kDaemon = "#!/bin/sh\nsleep 1000 &\nexec sleep 2000\n";

class Systemd : public LinuxTest {
 protected:
  void SetUp() override {
    ASSERT_TRUE(fs::exists(kSystemd)) << "systemd is not installed here";
    fs::create_directory(units());
    const std::string pools = world.file(
        "pools.yaml",
        "- name: storage\n  memMin: 64\n- name: storage/daemon\n  memMin: 48\n  memMax: 96\n");
    ::Test::writeFile(world.folder() / "storaged", kDaemon);
    fs::permissions(world.folder() / "storaged", fs::perms::owner_all);
    const std::string bin = ::Test::binFolder().string() + "/";
    const std::string head = "[Unit]\nDefaultDependencies=no\n";
    const std::string service =
        "[Service]\nEnvironment=KNOB_CONF=" + world.environment["KNOB_CONF"];
    unit("poolctl-load.service",
         head + service + "\nType=oneshot\nRemainAfterExit=yes\nExecStart=" + bin +
             "poolctl load -q " + pools + "\nExecStop=" + bin + "poolctl unload " + pools + "\n");
    unit("storaged.service",
         head + "Requires=poolctl-load.service\nAfter=poolctl-load.service\n" + service +
             "\nType=exec\nRestart=on-failure\nExecStart=" + bin +
             "poolctl-exec storage/daemon -- " + (world.folder() / "storaged").string() +
             "\nExecStopPost=-/bin/sh -c 'echo 1 >/sys/fs/cgroup/" + kPool + "/cgroup.kill'\n");
    unit("test.target", head + "Wants=storaged.service\n");
    startSystemd();
    ASSERT_TRUE(becomes([&] { return members() == 2; })) << "the service did not start";
  }

  void TearDown() override {
    if (systemd_ <= 0) return;
    kill(systemd_, SIGKILL);  // with it all processes of its name space
    waitpid(systemd_, nullptr, 0);
  }

  // Said from within systemd's own name spaces: it answers nobody else.
  std::string systemctl(const ::Test::Arguments &arguments) {
    const std::string unshare = std::to_string(systemd_);
    const std::string first =
        ::Test::readFile("/proc/" + unshare + "/task/" + unshare + "/children");
    ::Test::Arguments all{"--target=" + first.substr(0, first.find(' ')), "--pid", "--mount",
                          "systemctl"};
    all.insert(all.end(), arguments.begin(), arguments.end());
    const ::Test::ProcessResult result = world.run("/usr/bin/nsenter", all);
    return result.out + result.err;
  }

  static int members() {
    if (!groupExists(kPool)) return 0;
    return static_cast<int>(::Test::lines(readControl(kPool, "cgroup.procs")).size());
  }

  // Starting and ending processes is not announced to bystanders.
  template <typename F>
  static bool becomes(const F &condition) {
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(60);
    while (!condition()) {
      if (std::chrono::steady_clock::now() > end) return false;
      std::this_thread::sleep_for(std::chrono::milliseconds(50));
    }
    return true;
  }

  // A unit is still "activating" for a moment after its processes have started, and
  // "deactivating" after they have ended.
  testing::AssertionResult becomesActive(const ::Test::Arguments &names) {
    ::Test::Arguments arguments{"is-active"};
    arguments.insert(arguments.end(), names.begin(), names.end());
    std::string wanted, states;
    for (size_t i = 0; i < names.size(); ++i) wanted += "active\n";
    if (becomes([&] { return (states = systemctl(arguments)) == wanted; }))
      return testing::AssertionSuccess();
    return testing::AssertionFailure() << states;
  }

  static std::string mainMember() {
    return ::Test::lines(readControl(kPool, "cgroup.procs")).at(0);
  }

 private:
  fs::path units() { return world.folder() / "units"; }
  void unit(const std::string &name, const std::string &text) {
    ::Test::writeFile(units() / name, text);
  }

  // As the first process of a name space of processes of its own.
  void startSystemd() {
    systemd_ = fork();
    ASSERT_GE(systemd_, 0);
    if (systemd_ > 0) return;
    const std::string log = (world.folder() / "systemd.log").string();
    const int file = open(log.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
    dup2(file, STDOUT_FILENO);
    dup2(file, STDERR_FILENO);
    setenv("container", "uml", 1);
    setenv("SYSTEMD_UNIT_PATH", units().c_str(), 1);
    execl("/usr/bin/unshare", "unshare", "--pid", "--fork", "--kill-child", "--mount-proc",
          kSystemd, "--system", "--unit=test.target", "--show-status=no", nullptr);
    _exit(127);
  }

  pid_t systemd_ = -1;
};

TEST_F(Systemd, AServiceStartedThroughPoolctlExecIsInItsPoolAndInNoUnitsGroup) {
  EXPECT_TRUE(becomesActive({"poolctl-load.service", "storaged.service"}));
  EXPECT_EQ(numberIn(kPool, "memory.min"), 48 * kMiB);
  EXPECT_EQ(numberIn("host", "memory.min"), 64 * kMiB);
  for (const std::string &group : allGroups()) {
    if (group.find("storaged.service") != std::string::npos) {
      EXPECT_EQ(readControl(group, "cgroup.procs"), "") << group;
    }
  }
  EXPECT_TRUE(groupExists("system.slice"));
}

TEST_F(Systemd, ReloadAndRestartAndACrashLeaveThePoolAndTheServiceInIt) {
  systemctl({"daemon-reload"});
  systemctl({"restart", "storaged.service"});
  EXPECT_TRUE(becomes([] { return members() == 2; }));
  const std::string before = mainMember();
  kill(std::stoi(before), SIGKILL);
  EXPECT_TRUE(becomes([&] { return members() == 2 && mainMember() != before; }));
  EXPECT_TRUE(becomesActive({"storaged.service"}));
  EXPECT_EQ(numberIn(kPool, "memory.min"), 48 * kMiB);
  EXPECT_EQ(numberIn("host", "memory.min"), 64 * kMiB);
}

TEST_F(Systemd, StoppingTheServiceEmptiesThePoolAndStoppingTheLoadRemovesIt) {
  systemctl({"stop", "storaged.service"});
  EXPECT_TRUE(becomes([] { return members() == 0; }));
  systemctl({"stop", "poolctl-load.service"});
  EXPECT_EQ(systemctl({"show", "-P", "Result", "poolctl-load.service"}), "success\n");
  EXPECT_FALSE(groupExists("host/opt/storage"));
  EXPECT_EQ(numberIn("host", "memory.min"), 0);
}

}  // namespace
}  // namespace Uml
