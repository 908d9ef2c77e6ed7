// SPDX-License-Identifier: Apache-2.0
// The program's streams and memory when they fail: closed, full, a terminal, none left.
#include "cli_fixture.h"

namespace Test {
namespace {

// Runs COMMAND in a shell; $0 is poolctl.
ProcessResult shell(const World &world, const std::string &command) {
  return world.run("/bin/sh", {"-c", command, binFolder() / "poolctl"});
}

constexpr const char *kLost = "cannot write to standard output\n";

TEST_F(Cli, ResultsOfTheOptionModeOnAFullDiskAreAFailure) {
  for (const std::string options : {"-e", "-i", "-w 1", "-w 1 -m 5", "-i -m 5"}) {
    const ProcessResult result = shell(world, "\"$0\" -g host/opt " + options + " >/dev/full");
    expectRun(result, 1, "", kLost);
    EXPECT_EQ(world.groups().find("host/opt mem 5 5"), std::string::npos) << options;
  }
}

TEST_F(Cli, MissingGroupThatDisableCannotReportIsAFailure) {
  world.knob("group host/opt/a");
  const ProcessResult result = shell(world, "\"$0\" disable host/opt/none host/opt/a >/dev/full");
  expectRun(result, 1, "", kLost);
  EXPECT_EQ(world.groups().find("host/opt/a"), std::string::npos) << "the batch was not finished";
}

TEST_F(Cli, ResultsOnAClosedStreamAreAFailure) {
  expectRun(shell(world, "\"$0\" -g host/opt -e >&-"), 1, "", kLost);
  expectRun(shell(world, "\"$0\" list -v " + world.file("a.yaml", "[]").string() + " >&-"), 1, "",
            kLost);
}

// A file that the program opens would get the lowest free number. It is looked at while a call of
// the kernel has stopped it.
TEST_F(Cli, ClosedStreamsAreOccupiedBeforeAnyFileIsOpened) {
  world.knob("send signal=19 function=KNOB_Get");
  world.file("a.yaml", "- name: a\n");
  const ProcessResult result =
      shell(world,
            "\"$0\" load a.yaml >&- 2>&- &\n"
            "until grep -q 'State:.T' /proc/$!/status || ! kill -0 $!; do sleep 0.01; done\n"
            "readlink /proc/$!/fd/1 /proc/$!/fd/2\n"
            "kill -CONT $!; wait $!");
  expectRun(result, 0, "/dev/null\n/dev/null\n", "");
}

TEST_F(Cli, NameWithANulIsRefusedAndNoOtherGroupIsTouched) {
  world.knob("group host/opt/a");
  const auto file = world.file("nul.yaml", "- name: \"a\\0b\"\n");
  for (const char *command : {"load", "unload"}) {
    expectRun(world.poolctl({command, file}), 1, "",
              "KNOB_ParamListAddString: status 0x0bad0007\n");
    EXPECT_NE(world.groups().find("host/opt/a "), std::string::npos) << command;
  }
}

// The program "script" runs a command on a terminal of its own.
TEST_F(Cli, ControlCharactersOfNamesAreEscapedOnATerminalAlone) {
  const std::string pools = "- name: \"a\\e[31mb\"\n";
  const std::string list =
      (binFolder() / "poolctl").string() + " list -v " + world.file("a.yaml", pools).string();
  const ProcessResult shown = world.run("/usr/bin/script", {"-qec", list, "/dev/null"});
  EXPECT_NE(shown.out.find("\r\nhost/opt/a\\x1b[31mb,yes,"), std::string::npos) << shown.out;
  EXPECT_NE(shell(world, list).out.find("\nhost/opt/a\x1b[31mb,yes,"), std::string::npos);
}

TEST(ShortOfMemory, EveryCommandEndsInOrder) {
  World world;
  world.file("a.yaml", "- name: a\n");
  world.environment["LD_PRELOAD"] = NO_MEMORY_LIBRARY;
  expectRun(world.poolctl({"-g", "host/opt", "-e"}), 1, "",
            "poolctl: Group host/opt was not found: out of memory\n");
  for (const Arguments &arguments :
       {Arguments{"load", "a.yaml"}, Arguments{"list", "a.yaml"}, Arguments{"unload", "a.yaml"},
        Arguments{"disable", "host/opt/a"}}) {
    const ProcessResult result = world.poolctl(arguments);
    EXPECT_EQ(result.status, 1) << arguments[0];
    EXPECT_EQ(result.err, "std::bad_alloc\n") << arguments[0];
  }
}

}  // namespace
}  // namespace Test
