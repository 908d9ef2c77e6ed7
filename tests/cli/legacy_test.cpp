// SPDX-License-Identifier: Apache-2.0
// The older option mode: its options, its exit statuses, and the kernel calls of each request.
#include "cli_fixture.h"
#include "usage_texts.h"

namespace Test {
namespace {

const std::string kGroup = "host/opt/a";

class Legacy : public Cli {
 protected:
  void SetUp() override {
    world.knob("group host/opt/a min=100 max=200 ownPeakKB=1 childrenPeakKB=0");
    world.hostCalls();
  }

  void child() { world.knob("group host/opt/a/child"); }

  // The one message that the run sent to the system log; the same, begun with the program's name
  // and ended with a line end, must be on standard error.
  void expectLogged(const ProcessResult &result, int status, const std::string &message) {
    EXPECT_EQ(world.hostTrace().front(), "openlog \"poolctl\" 40 24");
    EXPECT_EQ(messages(), Calls{"syslog 6 \"" + message + "\""});
    EXPECT_EQ(world.hostTrace().back(), "closelog");
    std::string text = message;
    const size_t end = text.find("\\n");
    if (end != std::string::npos) text.resize(end);
    EXPECT_EQ(result.err, "poolctl: " + text + "\n");
    EXPECT_EQ(result.status, status);
  }

  Calls messages() {
    Calls result;
    for (const std::string &call : world.hostTrace())
      if (call.compare(0, 6, "syslog") == 0) result.push_back(call);
    return result;
  }

  size_t sleeps() {
    size_t count = 0;
    for (const std::string &call : world.hostTrace()) count += call == "sleep 100000";
    return count;
  }
};

TEST_F(Legacy, LooksTheGroupUpWithOneList) {
  expectRun(world.poolctl({"-g", kGroup}), 0, "", "");
  EXPECT_EQ(world.everyCall(),
            (Calls{"KNOB_CheckSig size=21 -> 0", "KNOB_CheckSig size=21 -> 0",
                   "KNOB_ParamListCreate kind=0 capacity=1 -> #1",
                   "KNOB_ParamListAddString #1 \"host/opt/a\" -> 0",
                   "KNOB_Set sched_groupPathNameToID instance=null input=[\"host/opt/a\"] output=8 "
                   "-> 0",
                   "KNOB_ParamListDestroy #1"}));
  EXPECT_EQ(world.hostTrace(), Calls{});
}

TEST_F(Legacy, AnUnknownGroupEndsTheRunEvenIfHelpFollows) {
  expectLogged(world.poolctl({"-g", "host/none", "-h"}), 1,
               "Group host/none was not found: status 0x0bad0003\\n");
}

TEST_F(Legacy, TheLastGroupCounts) {
  world.knob("group host/opt/b/child");
  world.knob("group host/opt/b");
  EXPECT_EQ(world.poolctl({"-g", kGroup, "-e", "-g", "host/opt/b"}).out, "not empty\n");
}

TEST_F(Legacy, OptionsWithoutAGroupAreRefused) {
  for (const Arguments &options :
       {Arguments{"-e"}, Arguments{"-i"}, Arguments{"-m", "5"}, Arguments{"-w", "1"}}) {
    expectLogged(world.poolctl(options), 1, "Group -g parameter was not specified\\n");
    EXPECT_EQ(world.kernelCalls(), Calls{});
  }
}

TEST_F(Legacy, HelpEndsTheRunAtOnce) {
  expectRun(world.poolctl({"-i", "-h", "-g", "host/none"}), 0, "", kLegacyUsage);
}

TEST_F(Legacy, AnUnknownOptionPrintsTheUsage) {
  const ProcessResult result = world.poolctl({"-g", kGroup, "-x"});
  expectRun(result, 1, "",
            (binFolder() / "poolctl").string() + ": invalid option -- 'x'\n" + kLegacyUsage);
}

TEST_F(Legacy, AnOptionWithoutItsValuePrintsTheUsage) {
  for (const std::string option : {"g", "m", "w"}) {
    expectRun(world.poolctl({"-" + option}), 1, "",
              (binFolder() / "poolctl").string() + ": option requires an argument -- '" + option +
                  "'\n" + kLegacyUsage);
  }
}

TEST_F(Legacy, OperandsMeanNothing) {
  expectRun(world.poolctl({"-g", kGroup, "load", "more"}), 0, "", "");
}

TEST_F(Legacy, AGroupWithoutChildrenIsEmpty) {
  expectRun(world.poolctl({"-g", kGroup, "-e"}), 0, "empty\n", "");
  const Calls calls = world.everyCall();
  EXPECT_EQ(
      Calls(calls.begin() + 6, calls.end()),
      (Calls{"KNOB_ParamListCreate kind=1 capacity=1 -> #2", "KNOB_ParamListAddInt #2 11 -> 0",
             "KNOB_GetInstanceListAlloc sched_groups_members_groups instance=[11] output=0 "
             "-> 0",
             "  handed out #3", "KNOB_ParamListNumInstances #3 -> 0", "KNOB_ParamListDestroy #3",
             "KNOB_ParamListDestroy #2"}));
}

TEST_F(Legacy, AGroupWithChildrenIsNotEmpty) {
  child();
  expectRun(world.poolctl({"-g", kGroup, "-e"}), 2, "not empty\n", "");
}

TEST_F(Legacy, TheEmptinessCheckExcludesEverythingElse) {
  child();
  expectRun(world.poolctl({"-m", "5", "-i", "-w", "1", "-e", "-g", kGroup}), 2, "not empty\n", "");
  EXPECT_EQ(world.groupCalls().size(), 2u);
}

TEST_F(Legacy, AnEmptinessCheckThatFailsSaysSo) {
  world.knob("fail function=KNOB_GetInstanceListAlloc status=0x0bad0001");
  expectLogged(world.poolctl({"-g", kGroup, "-e"}), 4,
               "Failed to check group host/opt/a: status 0x0bad0001\\n");
}

TEST_F(Legacy, AWaitOfNoTimeTimesOutWithoutALook) {
  for (const char *time : {"0", "-5"}) {
    expectLogged(world.poolctl({"-g", kGroup, "-w", time}), 3,
                 "Timeout waiting for host/opt/a to be empty");
    EXPECT_EQ(world.groupCalls().size(), 1u);
  }
}

TEST_F(Legacy, AWaitForAnEmptyGroupDoesNotSleep) {
  expectRun(world.poolctl({"-g", kGroup, "-w", "1"}), 0, "empty\n", "");
  EXPECT_EQ(world.hostTrace(), Calls{});
}

TEST_F(Legacy, AWaitOfOneSecondSleepsTenTimes) {
  child();
  const ProcessResult result = world.poolctl({"-g", kGroup, "-w", "1"});
  EXPECT_EQ(result.out, "");
  EXPECT_EQ(result.err, "poolctl: Timeout waiting for host/opt/a to be empty\n");
  EXPECT_EQ(result.status, 3);
  EXPECT_EQ(sleeps(), 10u);
  EXPECT_EQ(world.groupCalls().size(), 11u);
}

TEST_F(Legacy, AWaitEndsWhenTheChildrenAreGone) {
  world.knob("group host/opt/b emptiesAfter=3");
  world.knob("group host/opt/b/child");
  expectRun(world.poolctl({"-g", "host/opt/b", "-w", "1"}), 0, "empty\n", "");
  EXPECT_EQ(sleeps(), 3u);
}

TEST_F(Legacy, AFailureWhileWaitingCountsAsNotEmpty) {
  world.knob("fail function=KNOB_GetInstanceListAlloc status=0x0bad0001 count=2");
  expectRun(world.poolctl({"-g", kGroup, "-w", "1"}), 0, "empty\n", "");
  EXPECT_EQ(sleeps(), 2u);
}

TEST_F(Legacy, AFailureWhileWaitingForeverTimesOut) {
  world.knob("fail function=KNOB_GetInstanceListAlloc status=0x0bad0001 count=0");
  EXPECT_EQ(world.poolctl({"-g", kGroup, "-w", "2"}).status, 3);
  EXPECT_EQ(sleeps(), 20u);
}

TEST_F(Legacy, AWaitLeavesTheInformationOut) {
  expectRun(world.poolctl({"-g", kGroup, "-w", "1", "-i"}), 0, "empty\n", "");
  EXPECT_EQ(world.groupCalls().size(), 2u);
}

TEST_F(Legacy, AWaitIsFollowedByTheNewSize) {
  expectRun(world.poolctl({"-g", kGroup, "-m", "7", "-w", "1"}), 0, "empty\n", "");
  EXPECT_NE(world.groups().find("host/opt/a mem 7 7 -1 -3"), std::string::npos);
}

TEST_F(Legacy, AWaitThatTimesOutSetsNoSize) {
  child();
  EXPECT_EQ(world.poolctl({"-g", kGroup, "-m", "7", "-w", "1"}).status, 3);
  EXPECT_NE(world.groups().find("host/opt/a mem 100 200 -1 -3"), std::string::npos);
}

TEST_F(Legacy, InformationIsABlockOfFiveLines) {
  expectRun(world.poolctl({"-g", kGroup, "-i"}), 0,
            "{\n\"minMB\": 100,\n\"maxMB\": 200,\n\"rminpeakMB\": 1,\n\"rminchildpeakMB\": 0\n}\n",
            "");
  const Calls calls = world.everyCall();
  EXPECT_EQ(
      Calls(calls.begin() + 6, calls.end()),
      (Calls{"KNOB_ParamListCreate kind=1 capacity=1 -> #2", "KNOB_ParamListAddInt #2 11 -> 0",
             "KNOB_Get sched_groups_memAllocationInMB instance=[11] output=36 -> 0",
             "KNOB_Get sched_groups_stats_memoryStats instance=[11] output=382 -> 0",
             "KNOB_ParamListDestroy #2"}));
}

TEST_F(Legacy, PeaksAreRoundedUpToWholeMegabytes) {
  world.knob("group host/opt/b min=-1 max=-1 ownPeakKB=1024 childrenPeakKB=1025");
  EXPECT_EQ(world.poolctl({"-g", "host/opt/b", "-i"}).out,
            "{\n\"minMB\": -1,\n\"maxMB\": -1,\n\"rminpeakMB\": 1,\n\"rminchildpeakMB\": 2\n}\n");
}

TEST_F(Legacy, PeaksAreUnsigned) {
  world.knob("group host/opt/b ownPeakKB=9223372036854775808 childrenPeakKB=18446744073709550592");
  EXPECT_EQ(world.poolctl({"-g", "host/opt/b", "-i"}).out,
            "{\n\"minMB\": 0,\n\"maxMB\": -1,\n\"rminpeakMB\": 9007199254740992,\n"
            "\"rminchildpeakMB\": 18014398509481983\n}\n");
}

class LegacyStatisticsFailure : public testing::TestWithParam<const char *> {};

TEST_P(LegacyStatisticsFailure, PrintsNoBlock) {
  StandInWorld world;
  world.knob("group host/opt/a");
  world.knob(std::string("fail function=KNOB_Get status=0x0bad0001 node=") + GetParam());
  expectRun(world.poolctl({"-g", kGroup, "-i", "-m", "5"}), 4, "",
            "poolctl: Failed to get groups host/opt/a stats: status 0x0bad0001\n");
  EXPECT_EQ(world.misuse(), Calls{});
  EXPECT_NE(world.groups().find("host/opt/a mem 0 -1 -1 -3"), std::string::npos);
}

INSTANTIATE_TEST_SUITE_P(OfEachNode, LegacyStatisticsFailure,
                         testing::Values("sched_groups_memAllocationInMB",
                                         "sched_groups_stats_memoryStats"));

TEST_F(Legacy, InformationShowsTheSizeBeforeTheNewOne) {
  const ProcessResult result = world.poolctl({"-m", "7", "-i", "-g", kGroup});
  EXPECT_EQ(result.out.substr(0, 15), "{\n\"minMB\": 100,");
  EXPECT_EQ(result.status, 0);
  EXPECT_NE(world.groups().find("host/opt/a mem 7 7 -1 -3"), std::string::npos);
}

TEST_F(Legacy, InformationStaysWhenTheNewSizeIsRefused) {
  world.knob("fail node=sched_groups_memAllocationInMB function=KNOB_Set status=0x0bad00f5");
  const ProcessResult result = world.poolctl({"-i", "-m", "7", "-g", kGroup});
  EXPECT_EQ(lines(result.out).size(), 6u);
  expectLogged(result, 4, "Failed to set group host/opt/a mem: status 0x0bad00f5\\n");
}

TEST_F(Legacy, ASizeIsMinimumAndMaximum) {
  expectRun(world.poolctl({"-m", "512", "-g", kGroup}), 0, "", "");
  const Calls calls = world.everyCall();
  EXPECT_EQ(
      Calls(calls.begin() + 6, calls.end()),
      (Calls{"KNOB_ParamListCreate kind=1 capacity=1 -> #2", "KNOB_ParamListAddInt #2 11 -> 0",
             "KNOB_ParamListCreate kind=0 capacity=2 -> #3",
             "KNOB_ParamListAddString #3 \"min=512\" -> 0",
             "KNOB_ParamListAddString #3 \"max=512\" -> 0",
             "KNOB_Set sched_groups_memAllocationInMB instance=[11] "
             "input=[\"min=512\",\"max=512\"] output=0 -> 0",
             "KNOB_ParamListDestroy #3", "KNOB_ParamListDestroy #2"}));
}

TEST_F(Legacy, ASizeOfZeroIsSet) {
  expectRun(world.poolctl({"-m", "0", "-g", kGroup}), 0, "", "");
  EXPECT_NE(world.groups().find("host/opt/a mem 0 0 -1 -3"), std::string::npos);
}

TEST_F(Legacy, ASizeMayBeNegative) {
  expectRun(world.poolctl({"-m", "-1", "-g", kGroup}), 0, "", "");
  EXPECT_NE(world.groups().find("host/opt/a mem -1 -1 -1 -3"), std::string::npos);
}

TEST_F(Legacy, ASizeIsKeptInThirtyTwoBits) {
  expectRun(world.poolctl({"-m", "4294967301", "-g", kGroup}), 0, "", "");
  EXPECT_NE(world.groups().find("host/opt/a mem 5 5 -1 -3"), std::string::npos);
}

struct BadValue {
  const char *option, *value, *message;
};

class LegacyBadValue : public testing::TestWithParam<BadValue> {};

TEST_P(LegacyBadValue, IsRefusedInWords) {
  StandInWorld world;
  world.hostCalls();
  expectRun(world.poolctl({GetParam().option, GetParam().value, "-h"}), 1, "",
            std::string("poolctl: ") + GetParam().message + "\n");
  EXPECT_EQ(world.hostTrace().at(1), std::string("syslog 6 \"") + GetParam().message + "\\n\"");
}

INSTANTIATE_TEST_SUITE_P(
    Each, LegacyBadValue,
    testing::Values(BadValue{"-m", "", "memory size (MB) is not specified"},
                    BadValue{"-m", "12x", "incorrect value for memory size (MB) specified: 12x"},
                    BadValue{"-m", "x", "incorrect value for memory size (MB) specified: x"},
                    BadValue{"-m", " ", "incorrect value for memory size (MB) specified:  "},
                    BadValue{"-m", "1.5", "incorrect value for memory size (MB) specified: 1.5"},
                    BadValue{"-m", "0x10", "incorrect value for memory size (MB) specified: 0x10"},
                    BadValue{"-m", "%s%n", "incorrect value for memory size (MB) specified: %s%n"},
                    BadValue{"-w", "", "wait time is not specified"},
                    BadValue{"-w", "1s", "incorrect value for wait time specified: 1s"},
                    BadValue{"-w", "soon", "incorrect value for wait time specified: soon"},
                    BadValue{"-w", "1 ", "incorrect value for wait time specified: 1 "}));

TEST_F(Legacy, TheFirstBadOptionIsTheOneReported) {
  expectLogged(world.poolctl({"-m", "x", "-g", "host/none"}), 1,
               "incorrect value for memory size (MB) specified: x\\n");
  expectLogged(world.poolctl({"-g", "host/none", "-m", "x"}), 1,
               "Group host/none was not found: status 0x0bad0003\\n");
}

TEST_F(Legacy, TheElapsedTimeWrapsSoThatALongWaitNeverEndsByItself) {
  // 4295 seconds are more microseconds than the counter holds: at 42949 sleeps of 100 ms a
  // counter of 64 bits would have given up 2 sleeps later.
  world.knob("group host/opt/b emptiesAfter=43000");
  world.knob("group host/opt/b/child");
  expectRun(world.poolctl({"-g", "host/opt/b", "-w", "4295"}), 0, "empty\n", "");
  EXPECT_EQ(sleeps(), 43000u);
}

}  // namespace
}  // namespace Test
