// SPDX-License-Identifier: Apache-2.0
// Signals in the middle of a batch: which calls the commands still make, what they report, and how
// the process ends.
#include <signal.h>

#include "cli_fixture.h"

namespace Test {
namespace {

namespace fs = std::filesystem;

constexpr const char *kStoppedByTerm = "stopped by SIGTERM\n";

// A process that ends by a signal does not end its recording, so nothing is claimed about its
// lists.
class Stop : public testing::Test {
 protected:
  fs::path threePools() { return world.file("three.yaml", "- name: a\n- name: b\n- name: c\n"); }

  // The path or id of the group of each call of that node, in order.
  Calls callsOf(const std::string &node) {
    Calls result;
    for (const std::string &call : world.groupCalls()) {
      if (call.find(" sched_" + node + " ") == std::string::npos) continue;
      const size_t begin =
          call.find('[', call.find(node == "groupPathNameToID" ? "input=" : "instance="));
      result.push_back(call.substr(begin + 1, call.find(']', begin) - begin - 1));
    }
    return result;
  }

  size_t created() { return callsOf("groups_groupCreate").size(); }
  Calls deleted() { return callsOf("groups_delete"); }

  void expectEndedBy(int signal, const ProcessResult &result, const std::string &err) {
    EXPECT_EQ(result.signal, signal);
    EXPECT_EQ(result.status, -1);
    EXPECT_EQ(result.out, "");
    EXPECT_EQ(result.err, err);
  }

  StandInWorld world;
};

struct Signal {
  int number;
  const char *name;
};

class StopBy : public Stop, public testing::WithParamInterface<Signal> {};

TEST_P(StopBy, LoadFinishesThePoolAndDeletesWhatItMade) {
  world.knob("send signal=" + std::to_string(GetParam().number) +
             " node=sched_groups_memAllocationInMB group=host/opt/b");
  expectEndedBy(GetParam().number, world.poolctl({"load", threePools()}),
                std::string("stopped by ") + GetParam().name + "\n");
  EXPECT_EQ(created(), 2U);
  EXPECT_EQ(callsOf("groups_cpuAllocationInPct"), (Calls{"101", "102"}));
  EXPECT_EQ(deleted(), (Calls{"102", "101"}));
}

INSTANTIATE_TEST_SUITE_P(Signals, StopBy,
                         testing::Values(Signal{SIGINT, "SIGINT"}, Signal{SIGTERM, "SIGTERM"},
                                         Signal{SIGHUP, "SIGHUP"}),
                         [](const auto &signal) { return std::string(signal.param.name); });

TEST_F(Stop, LoadDuringTheLastPoolIsUndoneToo) {
  world.knob("send signal=15 node=sched_groups_cpuAllocationInPct group=host/opt/c");
  expectEndedBy(SIGTERM, world.poolctl({"load", threePools()}), kStoppedByTerm);
  EXPECT_EQ(created(), 3U);
  EXPECT_EQ(deleted(), (Calls{"103", "102", "101"}));
}

TEST_F(Stop, LoadLeavesGroupsThatExistedBefore) {
  world.knob("group host/opt/a");
  world.knob("send signal=15 node=sched_groups_groupCreate group=host/opt/a");
  expectEndedBy(SIGTERM, world.poolctl({"load", "-q", threePools()}), kStoppedByTerm);
  EXPECT_EQ(created(), 1U);
  EXPECT_EQ(deleted(), Calls{});
}

TEST_F(Stop, SignalsThatArriveTogetherCountAsOne) {
  for (const int signal : {SIGTERM, SIGHUP, SIGINT}) {
    world.knob("send signal=" + std::to_string(signal) + " node=sched_groups_groupCreate from=2");
  }
  const ProcessResult result = world.poolctl({"load", threePools()});
  EXPECT_NE(result.signal, 0);
  EXPECT_EQ(lines(result.err).size(), 1U) << result.err;
  EXPECT_EQ(deleted(), (Calls{"102", "101"}));
}

TEST_F(Stop, SecondSignalEndsTheUndoAndNamesWhatIsLeft) {
  world.knob("send signal=15 node=sched_groups_groupCreate from=3");
  world.knob("send signal=2 node=sched_groups_delete");
  expectEndedBy(SIGTERM, world.poolctl({"load", threePools()}),
                std::string(kStoppedByTerm) +
                    "host/opt/b: not undone\n"
                    "host/opt/a: not undone\n");
  EXPECT_EQ(deleted(), (Calls{"103"}));
}

TEST_F(Stop, SignalDuringTheUndoOfAFailureLetsItFinish) {
  world.knob("fail node=sched_groups_groupCreate group=host/opt/c status=0x0bad0001");
  world.knob("send signal=15 node=sched_groups_delete");
  expectEndedBy(SIGTERM, world.poolctl({"load", threePools()}),
                std::string(kStoppedByTerm) + "KNOB_Set: status 0x0bad0001\n");
  EXPECT_EQ(deleted(), (Calls{"102", "101"}));
}

TEST_F(Stop, FailureOfTheUndoIsReportedAndTheSignalKept) {
  world.knob("send signal=15 node=sched_groups_groupCreate from=2");
  world.knob("fail node=sched_groups_delete status=0x0bad0004 count=1");
  expectEndedBy(
      SIGTERM, world.poolctl({"load", threePools()}),
      std::string(kStoppedByTerm) + "Failed to delete host/opt/b: KNOB_Set: status 0x0bad0004\n");
  EXPECT_EQ(deleted(), (Calls{"102", "101"}));
}

TEST_F(Stop, UnloadRecreatesWhatItDeleted) {
  for (const char *name : {"a", "b", "c"}) world.knob(std::string("group host/opt/") + name);
  world.knob("send signal=15 node=sched_groups_delete group=host/opt/b");
  expectEndedBy(SIGTERM, world.poolctl({"unload", threePools()}), kStoppedByTerm);
  EXPECT_EQ(deleted(), (Calls{"13", "12"}));
  EXPECT_EQ(created(), 2U);
}

TEST_F(Stop, DisableEndsAfterThePoolInWork) {
  world.knob("group host/opt/a");
  world.knob("group host/opt/b");
  world.knob("send signal=15 node=sched_groups_memAllocationInMB");
  expectEndedBy(SIGTERM, world.poolctl({"disable", "host/opt/a", "host/opt/b"}), kStoppedByTerm);
  EXPECT_EQ(deleted(), (Calls{"11"}));
}

TEST_F(Stop, WaitOfDisableEndsAtOnce) {
  world.hostCalls();
  world.knob("group host/opt/a");
  world.knob("fail node=sched_groups_delete status=0x0bad0004 count=0");
  world.knob("send signal=2 node=sched_groups_delete from=3");
  expectEndedBy(SIGINT, world.poolctl({"disable", "-w", "1000", "host/opt/a"}),
                "stopped by SIGINT\n");
  EXPECT_EQ(deleted(), (Calls{"11", "11", "11"}));
}

TEST_F(Stop, EnableEndsAfterThePoolInWork) {
  SKIP_WITHOUT_PRIVATE_ETC();
  world.definition("ab.yaml", "- name: a\n- name: b\n");
  world.knob("send signal=15 node=sched_groups_groupCreate");
  expectEndedBy(SIGTERM, world.poolctl({"enable", "host/opt/a", "host/opt/b"}), kStoppedByTerm);
  EXPECT_EQ(callsOf("groups_cpuAllocationInPct"), (Calls{"101"}));
  EXPECT_EQ(created(), 1U);
}

TEST_F(Stop, WhileFilesAreReadIsTheDefault) {
  world.knob("send signal=15 function=KNOB_Get");
  expectEndedBy(SIGTERM, world.poolctl({"load", threePools()}), "");
  EXPECT_EQ(created(), 0U);
}

TEST_F(Stop, SignalsThatTheCallerIgnoresStayIgnored) {
  world.knob("send signal=1 node=sched_groups_groupCreate");
  const std::string command = "trap '' HUP; exec \"$0\" load three.yaml";
  threePools();
  const ProcessResult result = world.run("/bin/sh", {"-c", command, binFolder() / "poolctl"});
  EXPECT_EQ(result.err, "");
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(created(), 3U);
  EXPECT_EQ(deleted(), Calls{});
}

TEST_F(Stop, BrokenPipeEndsNeitherBatchNorUndo) {
  world.file("pools.yaml", "- name: a\n- name: b\n- name: c\n- name: d\n");
  world.knob("group host/opt/b");
  world.knob("fail node=sched_groups_groupCreate group=host/opt/d status=0x0bad0001");
  // The reader is gone before the first message, about b.
  world.run("/bin/sh", {"-c",
                        "(sleep 0.1; \"$0\" load pools.yaml; echo $? >status) 2>&1 | true; "
                        "while [ ! -s status ]; do sleep 0.01; done",
                        binFolder() / "poolctl"});
  EXPECT_EQ(readFile(world.folder() / "status"), "1\n");
  EXPECT_EQ(deleted(), (Calls{"102", "101"}));
  EXPECT_EQ(world.misuse(), Calls{});
}

}  // namespace
}  // namespace Test
