// SPDX-License-Identifier: Apache-2.0
// poolctl-exec as a process, on an emulated kernel.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <regex>

#include "world.h"

namespace Test {
namespace {

using testing::HasSubstr;
using testing::StartsWith;

class Exec : public testing::Test {
 protected:
  void SetUp() override {
    const ProcessResult result =
        world.poolctl({"load", world.file("pools.yaml",
                                          "- name: web\n- name: parent\n- name: parent/below\n"
                                          "- name: host/infra\n")});
    ASSERT_EQ(result.status, 0) << result.err;
  }

  ProcessResult exec(const Arguments &arguments) { return world.run("poolctl-exec", arguments); }

  void expectOwnFailure(const Arguments &arguments, const std::string &err) {
    const ProcessResult result = exec(arguments);
    EXPECT_EQ(result.status, 125);
    EXPECT_EQ(result.err, err);
    EXPECT_EQ(result.out, "");
  }

  // An executable file, or one that is not, depending on MODE.
  std::filesystem::path script(const std::string &text, mode_t mode) {
    const std::filesystem::path path = world.folder() / "pool-script";
    writeFile(path, text);
    chmod(path.c_str(), mode);
    return path;
  }

  World world;
};

TEST_F(Exec, StreamsAndStatusAreTheCommands) {
  world.input = "in";
  const ProcessResult result =
      exec({"web", "--", "/bin/sh", "-c", "cat; echo out; echo err >&2; exit 42"});
  EXPECT_EQ(result.out, "inout\n");
  EXPECT_EQ(result.err, "err\n");
  EXPECT_EQ(result.status, 42);
}

TEST_F(Exec, CallerSeesTheSignalThatEndsTheCommand) {
  EXPECT_EQ(exec({"web", "--", "/bin/sh", "-c", "kill -TERM $$"}).signal, SIGTERM);
}

TEST_F(Exec, CommandHasTheProcessIdOfPoolctlExec) {
  const ProcessResult result =
      world.run("/bin/sh", {"-c", "echo $$; exec poolctl-exec web -- /bin/sh -c 'echo $$'"});
  const std::vector<std::string> pids = lines(result.out);
  ASSERT_EQ(pids.size(), 2u) << result.err;
  EXPECT_EQ(pids[0], pids[1]);
}

TEST_F(Exec, PoolIsBusyWhileTheCommandRuns) {
  const ProcessResult result = exec({"web", "--", "/bin/sh", "-c", "poolctl disable host/opt/web"});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, HasSubstr("busy"));
  EXPECT_EQ(world.poolctl({"disable", "host/opt/web"}).status, 0);
}

TEST_F(Exec, NameIsBelowHostOptAndPathIsTakenWhole) {
  EXPECT_EQ(exec({"host/opt/web", "--", "true"}).status, 0);
  EXPECT_EQ(exec({"parent/below", "--", "true"}).status, 0);
  EXPECT_EQ(exec({"host/infra", "--", "true"}).status, 0);
  expectOwnFailure({"infra", "--", "true"},
                   "poolctl-exec: host/opt/infra: no such pool is loaded\n");
  expectOwnFailure({"host", "--", "true"}, "poolctl-exec: host/opt/host: no such pool is loaded\n");
}

TEST_F(Exec, ArgumentsAfterTheSeparatorAreUnchanged) {
  const ProcessResult result = exec(
      {"web", "--", "printf", "<%s>", "--help", "--", "", "[a,b]", "-x", "two words", "$HOME"});
  EXPECT_EQ(result.out, "<--help><--><><[a,b]><-x><two words><$HOME>");
}

TEST_F(Exec, CommandWithoutSlashIsSearchedInPath) {
  const auto path = script("#!/bin/sh\necho found\n", 0755);
  EXPECT_EQ(exec({"web", "--", "pool-script"}).status, 127);
  world.environment["PATH"] += ":" + world.folder().string();
  EXPECT_EQ(exec({"web", "--", "pool-script"}).out, "found\n");
}

TEST_F(Exec, CommandThatIsNotFoundExitsWith127) {
  const ProcessResult result = exec({"web", "--", "no-such-command"});
  EXPECT_EQ(result.status, 127);
  EXPECT_EQ(result.err, "poolctl-exec: no-such-command: No such file or directory\n");
  EXPECT_EQ(exec({"web", "--", "/no/such/command"}).status, 127);
  EXPECT_EQ(exec({"web", "--", ""}).status, 127);
}

TEST_F(Exec, CommandThatCannotBeExecutedExitsWith126) {
  const auto path = script("no program", 0644).string();
  const ProcessResult result = exec({"web", "--", path});
  EXPECT_EQ(result.status, 126);
  EXPECT_EQ(result.err, "poolctl-exec: " + path + ": Permission denied\n");
  EXPECT_EQ(exec({"web", "--", "/"}).status, 126);
}

TEST_F(Exec, PoolThatIsNotLoadedRunsNothing) {
  expectOwnFailure({"none", "--", "/bin/sh", "-c", "echo ran"},
                   "poolctl-exec: host/opt/none: no such pool is loaded\n");
  expectOwnFailure({"", "--", "true"}, "poolctl-exec: host/opt/: no such pool is loaded\n");
  expectOwnFailure({"host/../web", "--", "true"},
                   "poolctl-exec: host/../web: no such pool is loaded\n");
}

TEST_F(Exec, PoolWithPoolsBelowRunsNothing) {
  expectOwnFailure({"parent", "--", "/bin/sh", "-c", "echo ran"},
                   "poolctl-exec: host/opt/parent: the pool has pools below it, so it takes no "
                   "processes itself\n");
}

TEST_F(Exec, DisabledPoolRunsNothing) {
  ASSERT_EQ(world.poolctl({"disable", "-n", "host/opt/web"}).status, 0);
  expectOwnFailure({"web", "--", "/bin/sh", "-c", "echo ran"},
                   "poolctl-exec: host/opt/web: the pool is disabled\n");
}

TEST_F(Exec, PoolBelowADisabledOneRunsNothing) {
  ASSERT_EQ(world.poolctl({"disable", "-n", "host/opt/parent"}).status, 0);
  expectOwnFailure(
      {"parent/below", "--", "/bin/sh", "-c", "echo ran"},
      "poolctl-exec: host/opt/parent/below: disabled: host/opt/parent has no memory\n");
}

TEST_F(Exec, AKernelThatIsNotUsableIsReportedWithTheReason) {
  writeFile(world.folder() / "knob.conf", "kernel = none\n");
  expectOwnFailure({"web", "--", "true"},
                   "poolctl-exec: host/opt/web: kernel not usable (see `knobctl status`): " +
                       (world.folder() / "knob.conf").string() +
                       ":1: kernel: bad value \"none\" (one of: emulated, linux)\n");
}

TEST_F(Exec, WrongUsageExitsWith125) {
  for (const Arguments &arguments :
       {Arguments{}, Arguments{"web"}, Arguments{"web", "--"}, Arguments{"--", "true"},
        Arguments{"web", "true"}, Arguments{"web", "other", "--", "true"},
        Arguments{"--unknown", "web", "--", "true"}}) {
    const ProcessResult result = exec(arguments);
    EXPECT_EQ(result.status, 125) << testing::PrintToString(arguments);
    EXPECT_EQ(result.out, "");
    EXPECT_NE(result.err, "");
  }
}

TEST_F(Exec, HelpIsPrintedAndSucceeds) {
  const ProcessResult result = exec({"--help"});
  EXPECT_EQ(result.status, 0);
  EXPECT_THAT(result.out, HasSubstr("Usage: poolctl-exec [OPTIONS] POOL -- COMMAND"));
  EXPECT_THAT(result.out, HasSubstr("127 it was not found"));
  EXPECT_EQ(result.err, "");
}

TEST_F(Exec, VersionIsPrintedAndSucceeds) {
  const ProcessResult result = exec({"--version"});
  EXPECT_EQ(result.status, 0);
  EXPECT_THAT(result.out, testing::MatchesRegex("poolctl-exec \\(poolctl\\) [0-9]+\\.[0-9.]+\n"));
}

// libknob opens the kernel's state file; the command must not inherit the descriptor.
TEST_F(Exec, CommandInheritsNoFileOfTheLibrary) {
  const std::string command = "ls -l /proc/self/fd";
  const std::string with = exec({"web", "--", "/bin/sh", "-c", command}).out;
  EXPECT_THAT(with, Not(HasSubstr("kernel.db")));
  EXPECT_EQ(lines(with).size(), lines(world.run("/bin/sh", {"-c", command}).out).size());
}

TEST_F(Exec, CommandHasTheCallersSignalMasks) {
  const std::string command = "grep Sig /proc/self/status";
  const auto masks = [](const std::string &out) {
    return std::regex_replace(out, std::regex("SigQ.*\n"), "");
  };
  EXPECT_EQ(masks(exec({"web", "--", "/bin/sh", "-c", command}).out),
            masks(world.run("/bin/sh", {"-c", command}).out));
}

}  // namespace
}  // namespace Test
