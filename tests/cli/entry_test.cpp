// SPDX-License-Identifier: Apache-2.0
// The entry point: the check of the kernel, the choice of a command, the help, and the one report
// of an error that a command lets escape.
#include "cli_fixture.h"
#include "usage_texts.h"

namespace Test {
namespace {

const std::string kAllUsages = std::string(kDisableUsage) + "\n" + kUnloadUsage + "\n" +
                               kEnableUsage + "\n" + kLoadUsage + "\n" + kListUsage + "\n";

constexpr const char *kNoGroup = "poolctl: Group -g parameter was not specified\n";

TEST_F(Cli, WithoutArgumentsAllUsagesAreFollowedByTheOptionModesComplaint) {
  world.hostCalls();
  expectRun(world.poolctl({}), 1, "", kAllUsages + kNoGroup);
  EXPECT_EQ(world.hostTrace(),
            (Calls{"openlog \"poolctl\" 40 24",
                   "syslog 6 \"Group -g parameter was not specified\\n\"", "closelog"}));
}

TEST_F(Cli, HelpOptionPrintsAllUsagesAndThenTheOptionModes) {
  expectRun(world.poolctl({"-h"}), 0, "", kAllUsages + kLegacyUsage);
}

TEST_F(Cli, HelpOptionWithMoreArgumentsIsStillTheGlobalHelp) {
  expectRun(world.poolctl({"-h", "list"}), 0, "", kAllUsages + kLegacyUsage);
}

TEST_F(Cli, AnOptionGroupThatIsNotExactlyHelpPrintsNoGlobalHelp) {
  expectRun(world.poolctl({"-he"}), 0, "", kLegacyUsage);
}

TEST_F(Cli, AGroupOptionGoesToTheOptionModeWithoutHelp) {
  expectRun(world.poolctl({"-g", "host/opt"}), 0, "", "");
}

TEST_F(Cli, ADashAloneGoesToTheOptionMode) {
  expectRun(world.poolctl({"-"}), 1, "", kNoGroup);
}

TEST_F(Cli, ACommandNameBehindAnOptionIsNoCommand) {
  const ProcessResult result = world.poolctl({"-q", "load"});
  const std::string program = (binFolder() / "poolctl").string();
  expectRun(result, 1, "", program + ": invalid option -- 'q'\n" + kLegacyUsage);
}

struct Usage {
  const char *command, *text;
};

class CommandUsage : public testing::TestWithParam<Usage> {
 protected:
  StandInWorld world;
};

TEST_P(CommandUsage, IsPrintedForTheHelpOption) {
  expectRun(world.poolctl({GetParam().command, "-h"}), 0, "", GetParam().text);
}

TEST_P(CommandUsage, FollowsGetoptsComplaintForAnUnknownOption) {
  const std::string command = GetParam().command;
  expectRun(world.poolctl({command, "-x"}), 1, "",
            command + ": invalid option -- 'x'\n" + GetParam().text);
}

TEST_P(CommandUsage, ComesForAnUnknownOptionBeforeAndBehindOperandsToo) {
  const std::string command = GetParam().command;
  for (const Arguments &rest : {Arguments{"operand", "-x"}, Arguments{"-x", "operand"}}) {
    const ProcessResult result = world.poolctl({command, rest[0], rest[1]});
    expectRun(result, 1, "", command + ": invalid option -- 'x'\n" + GetParam().text);
    EXPECT_EQ(world.kernelCalls(), Calls{});
  }
}

TEST_P(CommandUsage, ComesInPlaceOfTheWorkOnOperands) {
  for (const Arguments &rest : {Arguments{"operand", "-h"}, Arguments{"-h", "operand"}}) {
    expectRun(world.poolctl({GetParam().command, rest[0], rest[1]}), 0, "", GetParam().text);
    EXPECT_EQ(world.kernelCalls(), Calls{});
  }
}

INSTANTIATE_TEST_SUITE_P(Every, CommandUsage,
                         testing::Values(Usage{"list", kListUsage}, Usage{"load", kLoadUsage},
                                         Usage{"unload", kUnloadUsage},
                                         Usage{"enable", kEnableUsage},
                                         Usage{"disable", kDisableUsage}),
                         [](const auto &usage) { return std::string(usage.param.command); });

class UnknownCommand : public testing::TestWithParam<const char *> {};

TEST_P(UnknownCommand, NamesTheValidOnesInTheirFixedOrder) {
  StandInWorld world;
  expectRun(world.poolctl({GetParam(), "-h"}), 1, "",
            std::string("Unknown command ") + GetParam() +
                "\nValid commands: disable unload enable load list\n");
}

INSTANTIATE_TEST_SUITE_P(Names, UnknownCommand,
                         testing::Values("frob", "LIST", "lis", "lists", "", " list", "list "));

class Signature : public Cli {
 protected:
  void mismatchFrom(int check) {
    world.knob("mismatch-from " + std::to_string(check));
    world.knob("running-build Jan  1 2020 11:22:33");
    world.knob("own-build Feb 29 2024 23:59:59");
  }
};

TEST_F(Signature, OfTwentyCharactersIsAskedForWithRoomForItsEnd) {
  world.poolctl({"list", "-h"});
  EXPECT_EQ(world.everyCall(), Calls{"KNOB_CheckSig size=21 -> 0"});
}

TEST_F(Signature, MismatchEndsACommandBeforeAnythingElse) {
  mismatchFrom(1);
  expectRun(world.poolctl({"list", "-h"}), 1, "",
            "error: md5 signature mismatch with running nucleus built on Jan  1 2020 11:22:33, my "
            "build date: Feb 29 2024 23:59:59\n");
  EXPECT_EQ(world.everyCall(), Calls{"KNOB_CheckSig size=21 -> 1"});
}

TEST_F(Signature, MismatchPrintsNoHelpAndNoUnknownCommand) {
  mismatchFrom(1);
  const std::string message = world.poolctl({"frob"}).err;
  EXPECT_EQ(message, world.poolctl({}).err);
  EXPECT_EQ(message, world.poolctl({"-h"}).err);
  EXPECT_EQ(lines(message).size(), 1u);
}

TEST_F(Signature, IsCheckedAgainByTheOptionModeWithWordsOfItsOwn) {
  mismatchFrom(2);
  expectRun(world.poolctl({"-g", "host/opt"}), 1, "",
            "error: md5 signature mismatch with running nucleus built on Jan  1 2020 11:22:33 (my "
            "build date: Feb 29 2024 23:59:59)\n");
  EXPECT_EQ(world.everyCall(), (Calls{"KNOB_CheckSig size=21 -> 0", "KNOB_CheckSig size=21 -> 1"}));
}

TEST_F(Signature, IsNotCheckedAgainByASubCommand) {
  mismatchFrom(2);
  EXPECT_EQ(world.poolctl({"list", world.file("empty.yaml", "")}).status, 0);
}

TEST_F(Cli, AnEscapingKernelErrorIsOneLineWithItsText) {
  world.knob("fail node=sched_groups_groupCreate status=0x0bad00f5");
  const auto file = world.file("a.yaml", "- name: a\n");
  expectRun(world.poolctl({"load", file}), 1, "", "KNOB_Set: status 0x0bad00f5\n");
}

TEST_F(Cli, AnEscapingFileErrorIsOneLineWithTheFile) {
  const auto file = world.file("a.yaml", "- name: a\n  color: 1\n");
  expectRun(world.poolctl({"load", file}), 1, "",
            file.string() + ": line 2 column 3: invalid rp field\n");
}

}  // namespace
}  // namespace Test
