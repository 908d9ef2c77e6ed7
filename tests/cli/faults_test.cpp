// SPDX-License-Identifier: Apache-2.0
// The kernel interface fails at the first call, then at the second, and so on until a command gets
// through; once, and from that call on. After each run the groups, the messages and the status
// must be right, and no parameter list may be lost.
#include <functional>
#include <set>

#include "cli_fixture.h"

namespace Test {
namespace {

constexpr const char *kEmptyTree =
    "host mem 0 -1 -1 -3 cpu 0 -1 -1 -3\n"
    "host/opt mem 0 -1 -1 -3 cpu 0 -1 -1 -3\n";

enum class Failing { kOnce, kFromThenOn };

class Faults : public CliWithRpD {
 protected:
  void SetUp() override {
    CliWithRpD::SetUp();
    if (IsSkipped()) return;
    world.hostCalls();
    world.definition("pools.yaml",
                     "- {name: a, memMin: 1, memMax: 2, memMinLimit: 3, memShares: 4}\n"
                     "- {name: a/b, cpuMin: 5, cpuMax: 6, cpuShares: 7}\n"
                     "- {name: c, mem: 8}\n");
  }

  using Check = std::function<void(int nth, const ProcessResult &result)>;

  // Runs the command with call 1 failing, then call 2, until no call is left to fail; the number
  // of failing runs.
  int forEachCall(Failing how, const std::string &groups, const Arguments &arguments,
                  const Check &check) {
    for (int nth = 1; nth < 1000; ++nth) {
      const std::string count = how == Failing::kOnce ? " count=1" : " count=0";
      writeFile(world.environment.at("RECORDING_KNOB_SCRIPT"),
                groups + "fail status=0x0bad0001 from=" + std::to_string(nth) + count + "\n");
      const ProcessResult result = world.poolctl(arguments);
      EXPECT_EQ(world.misuse(), Calls{}) << "call " << nth;
      EXPECT_EQ(result.signal, 0) << "call " << nth;
      if (!world.wasInjected()) return nth - 1;
      SCOPED_TRACE("call " + std::to_string(nth) + ", standard error: " + result.err);
      check(nth, result);
    }
    ADD_FAILURE() << "the command never got through";
    return 0;
  }

  // Paths of the groups at the end, but for the two that are always there.
  std::set<std::string> paths() {
    std::set<std::string> result;
    for (const std::string &line : lines(world.groups()))
      result.insert(line.substr(0, line.find(' ')));
    result.erase("host");
    result.erase("host/opt");
    return result;
  }
};

TEST_F(Faults, LoadThatFailsOnceLeavesNoGroupAndOneMessage) {
  const int failed = forEachCall(Failing::kOnce, "", {"load"}, [&](int nth, const auto &result) {
    EXPECT_EQ(result.status, 1);
    EXPECT_EQ(result.out, "");
    EXPECT_EQ(lines(result.err).size(), 1u);
    EXPECT_EQ(result.err == "/etc/rp.d/pools.yaml: KNOB_Get failed\n", nth <= 4);
    EXPECT_EQ(world.groups(), kEmptyTree);
  });
  // Four facts; for each pool 8 calls to create it, 7 or 8 to set memory and 8 to set CPU.
  EXPECT_EQ(failed, 4 + (8 + 8 + 8) + 2 * (8 + 7 + 8));
  EXPECT_EQ(paths().size(), 3u);
}

TEST_F(Faults, LoadThatKeepsFailingNamesEveryGroupThatIsLeft) {
  forEachCall(Failing::kFromThenOn, "", {"load"}, [&](int, const auto &result) {
    EXPECT_EQ(result.status, 1);
    std::set<std::string> left = paths();
    const std::vector<std::string> messages = lines(result.err);
    for (size_t i = 0; i + 1 < messages.size(); ++i) {
      const std::string begin = "Failed to delete ";
      EXPECT_EQ(messages[i].substr(0, begin.size()), begin);
      left.erase(messages[i].substr(begin.size(), messages[i].find(':') - begin.size()));
    }
    // A new group whose own rollback failed is no group of the undo list.
    EXPECT_LE(left.size(), 1u);
    EXPECT_NE(messages.back().find("KNOB_"), std::string::npos);
  });
}

TEST_F(Faults, UnloadThatFailsOnceLeavesEveryGroupAsItWas) {
  const std::string groups =
      "group host/opt/a min=1 max=2 minLimit=3 shares=4 cpuShares=9\n"
      "group host/opt/a/b cpuMin=5 cpuMax=6 cpuShares=7\n"
      "group host/opt/c min=11 shares=12\n";
  const std::string before = std::string(kEmptyTree) +
                             "host/opt/a mem 1 2 3 4 cpu 0 -1 -1 9\n"
                             "host/opt/a/b mem 0 -1 -1 -3 cpu 5 6 -1 7\n"
                             "host/opt/c mem 11 -1 -1 12 cpu 0 -1 -1 -3\n";
  const int failed = forEachCall(Failing::kOnce, groups, {"unload"}, [&](int, const auto &result) {
    EXPECT_EQ(result.status, 1);
    EXPECT_EQ(result.out, "");
    EXPECT_EQ(lines(result.err).size(), 1u);
    EXPECT_EQ(world.groups(), before);
  });
  // Four facts; for each pool 3 calls to look it up, 3 for each read, 3 to delete it.
  EXPECT_EQ(failed, 4 + 3 * 12);
  EXPECT_EQ(world.groups(), kEmptyTree);
}

TEST_F(Faults, UnloadThatKeepsFailingNamesEveryGroupThatIsGone) {
  const std::string groups = "group host/opt/a\ngroup host/opt/a/b\ngroup host/opt/c\n";
  forEachCall(Failing::kFromThenOn, groups, {"unload"}, [&](int, const auto &result) {
    EXPECT_EQ(result.status, 1);
    std::set<std::string> known = paths();
    const std::vector<std::string> messages = lines(result.err);
    for (size_t i = 0; i + 1 < messages.size(); ++i) {
      const std::string begin = "Failed to recreate ";
      EXPECT_EQ(messages[i].substr(0, begin.size()), begin);
      known.insert(messages[i].substr(begin.size(), messages[i].find(':') - begin.size()));
    }
    EXPECT_EQ(known.size(), 3u);
  });
}

TEST_F(Faults, EnableLeavesEachPoolAsItWasOrWholeAndSaysWhich) {
  const std::string disabled = "group host/opt/c min=0 max=0 minLimit=0 shares=0\n";
  const int failed = forEachCall(
      Failing::kOnce, disabled, {"enable", "host/opt/a", "host/opt/c"},
      [&](int, const auto &result) {
        EXPECT_EQ(lines(result.err).size(), 1u);
        const std::string groups = world.groups();
        const bool made =
            groups.find("host/opt/a mem 1 2 3 4 cpu 0 -1 -1 1000\n") != std::string::npos;
        const bool restored = groups.find("host/opt/c mem 8 8 -1 0 ") != std::string::npos;
        EXPECT_EQ(paths().count("host/opt/a"), made ? 1u : 0u);
        EXPECT_FALSE(made && restored);
        // What is reported with its name does not end the run.
        EXPECT_EQ(restored, result.err.find("host/opt/a: KNOB") == 0);
        EXPECT_EQ(result.status, result.err.find("host/opt/") == 0 ? 0 : 1);
      });
  // Four facts; a lookup, and a creation with both settings; a lookup, a read and a set.
  EXPECT_EQ(failed, 4 + (3 + 8 + 8 + 8) + (3 + 3 + 7));
}

TEST_F(Faults, DisableStopsAtAFailureAndReportsItTwice) {
  const std::string groups = "group host/opt/a min=1 max=2\ngroup host/opt/c min=3 max=4\n";
  const int failed =
      forEachCall(Failing::kOnce, groups, {"disable", "-w", "1", "host/opt/a", "host/opt/c"},
                  [&](int nth, const auto &result) {
                    EXPECT_EQ(result.status, 1);
                    const std::vector<std::string> messages = lines(result.err);
                    ASSERT_EQ(messages.size(), 2u);
                    const std::string name = nth <= 14 ? "host/opt/a" : "host/opt/c";
                    EXPECT_EQ(messages[0], name + ": " + messages[1]);
                    EXPECT_EQ(paths().count("host/opt/a"), nth <= 14 ? 1u : 0u);
                    EXPECT_EQ(paths().count("host/opt/c"), 1u);
                  });
  // For each a lookup, a set with shares, a delete.
  EXPECT_EQ(failed, 2 * (3 + 8 + 3));
}

// What a run of the option mode ends with for each call that fails in turn.
struct LegacyOutcome {
  int status;
  std::string out, err;
};

class LegacyFaults : public Cli {
 protected:
  void expectOutcomes(const Arguments &options, const std::vector<LegacyOutcome> &outcomes) {
    world.hostCalls();
    Arguments arguments{"-g", "host/opt/a"};
    arguments.insert(arguments.end(), options.begin(), options.end());
    int nth = 1;
    for (const LegacyOutcome &outcome : outcomes) {
      SCOPED_TRACE("call " + std::to_string(nth));
      runFailing(arguments, nth++);
      expectRun(result, outcome.status, outcome.out, outcome.err);
      EXPECT_TRUE(world.wasInjected());
    }
    runFailing(arguments, nth);
    EXPECT_FALSE(world.wasInjected()) << "more calls than expected";
    EXPECT_EQ(result.status, 0);
  }

  const std::string noGroup = "poolctl: Group host/opt/a was not found: status 0x0bad00";
  const std::vector<LegacyOutcome> lookUp{
      {1, "", noGroup + "14\n"}, {1, "", noGroup + "01\n"}, {1, "", noGroup + "01\n"}};

  std::vector<LegacyOutcome> lookUpAnd(const std::vector<LegacyOutcome> &more) {
    std::vector<LegacyOutcome> all = lookUp;
    all.insert(all.end(), more.begin(), more.end());
    return all;
  }

  ProcessResult result;

 private:
  void runFailing(const Arguments &arguments, int nth) {
    writeFile(
        world.environment.at("RECORDING_KNOB_SCRIPT"),
        "group host/opt/a min=1 max=2\nfail status=0x0bad0001 from=" + std::to_string(nth) + "\n");
    result = world.poolctl(arguments);
    EXPECT_EQ(world.misuse(), Calls{});
  }
};

TEST_F(LegacyFaults, LookUp) {
  expectOutcomes({}, lookUp);
}

TEST_F(LegacyFaults, EmptinessCheck) {
  const std::string failed = "poolctl: Failed to check group host/opt/a: status 0x0bad00";
  expectOutcomes(
      {"-e"},
      lookUpAnd({{4, "", failed + "14\n"}, {4, "", failed + "01\n"}, {4, "", failed + "01\n"}}));
}

TEST_F(LegacyFaults, WaitTakesAFailureForAGroupThatIsNotEmpty) {
  const LegacyOutcome waited{0, "empty\n", ""};
  expectOutcomes({"-w", "1"}, lookUpAnd({waited, waited, waited}));
}

TEST_F(LegacyFaults, Information) {
  const std::string failed = "poolctl: Failed to get groups host/opt/a stats: status 0x0bad00";
  expectOutcomes({"-i"}, lookUpAnd({{4, "", failed + "14\n"},
                                    {4, "", failed + "01\n"},
                                    {4, "", failed + "01\n"},
                                    {4, "", failed + "01\n"}}));
}

TEST_F(LegacyFaults, NewSize) {
  const std::string failed = "poolctl: Failed to set group host/opt/a mem: status 0x0bad00";
  // The two lists, then the id and the two settings; or the lists one after the other.
  expectOutcomes({"-m", "5"}, lookUpAnd({{4, "", failed + "14\n"},
                                         {4, "", failed + "01\n"},
                                         {4, "", failed + "14\n"},
                                         {4, "", failed + "01\n"},
                                         {4, "", failed + "01\n"},
                                         {4, "", failed + "01\n"}}));
  EXPECT_NE(world.groups().find("host/opt/a mem 5 5 "), std::string::npos);
}

}  // namespace
}  // namespace Test
