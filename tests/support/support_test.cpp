// SPDX-License-Identifier: Apache-2.0
// Tests of the test helpers: a test that uses them must be able to fail.
#include <gtest/gtest.h>

#include <csignal>

#include "platform/knob.h"
#include "process.h"
#include "recording_knob.h"
#include "stand_ins.h"

namespace Test {
namespace {

ProcessResult shell(const World &world, const std::string &script) {
  return world.run("/bin/sh", {"-c", script});
}

TEST(Process, KeepsBothStreamsAsBytesAndTheStatus) {
  const World world;
  const ProcessResult result = shell(world, "printf 'a\\000b'; printf c >&2; exit 7");
  EXPECT_EQ(result.out, std::string("a\0b", 3));
  EXPECT_EQ(result.err, "c");
  EXPECT_EQ(result.status, 7);
}

TEST(Process, DistinguishesASignalFromAnExit) {
  const World world;
  const ProcessResult result = shell(world, "kill -TERM $$");
  EXPECT_EQ(result.signal, SIGTERM);
  EXPECT_EQ(result.status, -1);
}

TEST(Process, IsKilledWithItsChildrenAtTheLimit) {
  const World world;
  Command command;
  command.program = "/bin/sh";
  command.arguments = {"-c", "/bin/sleep 1000 & echo $!; wait"};
  command.limit = std::chrono::seconds(1);
  const ProcessResult result = run(command);
  EXPECT_TRUE(result.timedOut);
  EXPECT_EQ(result.signal, SIGKILL);
}

TEST(Process, GetsItsInput) {
  World world;
  world.input = "from the test";
  EXPECT_EQ(shell(world, "cat").out, "from the test");
}

TEST(PrivateEtc, HasTheTestsRpDAndTheMachinesOtherFiles) {
  SKIP_WITHOUT_PRIVATE_ETC();
  World world;
  world.definition("a.yaml", "content");
  const ProcessResult result = shell(world, "ls /etc/rp.d; cat /etc/rp.d/a.yaml; cat /etc/passwd");
  EXPECT_EQ(result.out, "a.yaml\ncontent" + readFile("/etc/passwd"));
}

TEST(PrivateEtc, LeavesTheMachinesOwnEtcAlone) {
  SKIP_WITHOUT_PRIVATE_ETC();
  World world;
  world.definition("only-in-the-test.yaml", "");
  shell(world, "touch /etc/only-in-the-test");
  EXPECT_FALSE(std::filesystem::exists("/etc/rp.d/only-in-the-test.yaml"));
  EXPECT_FALSE(std::filesystem::exists("/etc/only-in-the-test"));
}

TEST(HostCalls, SleepTakesNoTimeButMovesTheClock) {
  StandInWorld world;
  world.hostCalls("100");
  // Longer than run() waits for a program.
  EXPECT_EQ(shell(world, "/bin/sleep 1000").status, 0);
  EXPECT_EQ(world.hostTrace(), std::vector<std::string>{"sleep 1000000000"});
}

// Calls the recording libknob in the process of the test.
class RecordingKnob : public testing::Test {
 protected:
  RecordingKnob() {
    for (const char *name :
         {"RECORDING_KNOB_TRACE", "RECORDING_KNOB_SCRIPT", "RECORDING_KNOB_GROUPS"})
      setenv(name, world.environment.at(name).c_str(), 1);
  }

  StandInWorld world;
};

TEST_F(RecordingKnob, ReportsAListThatIsNeverDestroyed) {
  KNOB_ParamListCreate(0, 1);
  RecordingKnobEnd();
  EXPECT_EQ(world.misuse(), std::vector<std::string>{"MISUSE list #1 was never destroyed"});
}

TEST_F(RecordingKnob, ReportsASecondDestroyAndALaterUse) {
  KNOB_ParamList *list = KNOB_ParamListCreate(0, 1);
  KNOB_ParamListDestroy(list);
  KNOB_ParamListDestroy(list);
  EXPECT_NE(KNOB_ParamListAddInt(list, 1), 0u);
  RecordingKnobEnd();
  EXPECT_EQ(world.misuse(),
            (std::vector<std::string>{"MISUSE KNOB_ParamListDestroy of the destroyed list #1",
                                      "MISUSE KNOB_ParamListAddInt of the destroyed list #1"}));
}

TEST_F(RecordingKnob, FailsTheCallsThatARuleNames) {
  world.knob("fail function=KNOB_ParamListCreate status=1 from=2 count=2");
  const bool made[] = {KNOB_ParamListCreate(0, 1) != nullptr, KNOB_ParamListCreate(0, 1) != nullptr,
                       KNOB_ParamListCreate(0, 1) != nullptr,
                       KNOB_ParamListCreate(0, 1) != nullptr};
  RecordingKnobEnd();
  EXPECT_TRUE(made[0] && !made[1] && !made[2] && made[3]);
  EXPECT_TRUE(world.wasInjected());
}

TEST_F(RecordingKnob, ReturnsTheScriptedGroups) {
  world.knob("group host/opt/a min=5 max=6");
  KNOB_ParamList *list = KNOB_ParamListCreate(1, 1);
  KNOB_ParamListAddInt(list, 11);
  int64_t record[5] = {};
  EXPECT_EQ(KNOB_Get(KNOB_NODE_sched_groups_memAllocationInMB, list, record, 36), 0u);
  KNOB_ParamListDestroy(list);
  RecordingKnobEnd();
  EXPECT_EQ(record[0], 5);
  EXPECT_EQ(record[1], 6);
  EXPECT_EQ(world.groupCalls(),
            std::vector<std::string>{"KNOB_Get sched_groups_memAllocationInMB instance=[11] "
                                     "output=36 -> 0"});
  EXPECT_EQ(world.misuse(), std::vector<std::string>{});
}

}  // namespace
}  // namespace Test
