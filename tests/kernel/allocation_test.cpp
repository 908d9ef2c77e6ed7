// SPDX-License-Identifier: Apache-2.0
// What a set takes: any of four settings, each once, checked whole and applied whole.
#include "contract_test.h"

namespace Contract {
namespace {

// The same cases for memory and for CPU.
struct ResourceCalls {
  const char *name;
  KNOB_ReturnStatus (*set)(int64_t, const Texts &);
  Answer<Settings> (*get)(int64_t);
};

class Allocations : public ContractTest, public testing::WithParamInterface<ResourceCalls> {
 protected:
  Allocations() : group_(newGroup("host/opt", "pool")) {}

  KNOB_ReturnStatus set(const Texts &settings) { return GetParam().set(group_, settings); }
  Settings get() {
    const auto answer = GetParam().get(group_);
    EXPECT_EQ(answer.status, kSuccess);
    return answer.value;
  }
  void expectRefused(const Texts &settings) {
    const Settings before = get();
    EXPECT_EQ(set(settings), kBadParameter) << testing::PrintToString(settings);
    EXPECT_EQ(get(), before) << testing::PrintToString(settings);
  }

  const int64_t group_;
};

INSTANTIATE_TEST_SUITE_P(Of, Allocations,
                         testing::Values(ResourceCalls{"Memory", setMemory, memory},
                                         ResourceCalls{"Cpu", setCpu, cpu}),
                         [](const auto &resource) { return std::string(resource.param.name); });

TEST_P(Allocations, ANewGroupHasNothingReservedAndNoLimit) {
  EXPECT_EQ(get(), kNewGroup);
}

TEST_P(Allocations, AllFourSettingsAreTakenTogether) {
  EXPECT_EQ(set({"min=10", "max=20", "minLimit=15", "shares=1000"}), kSuccess);
  EXPECT_EQ(get(), (Settings{10, 20, 15, 1000}));
}

TEST_P(Allocations, TheOrderOfTheSettingsDoesNotMatter) {
  EXPECT_EQ(set({"shares=7", "minLimit=15", "max=20", "min=10"}), kSuccess);
  EXPECT_EQ(get(), (Settings{10, 20, 15, 7}));
}

TEST_P(Allocations, ASettingThatIsNotGivenStays) {
  ASSERT_EQ(set({"min=10", "max=20", "minLimit=15", "shares=1000"}), kSuccess);
  EXPECT_EQ(set({"max=30"}), kSuccess);
  EXPECT_EQ(set({"shares=-4"}), kSuccess);
  EXPECT_EQ(get(), (Settings{10, 30, 15, -4}));
}

TEST_P(Allocations, AMinOfMinusOneCountsAsZero) {
  ASSERT_EQ(set({"min=10"}), kSuccess);
  EXPECT_EQ(set({"min=-1"}), kSuccess);
  EXPECT_EQ(get().min, 0);
}

TEST_P(Allocations, MinusOneEndsALimit) {
  ASSERT_EQ(set({"max=20", "minLimit=15"}), kSuccess);
  EXPECT_EQ(set({"max=-1", "minLimit=-1"}), kSuccess);
  EXPECT_EQ(get(), kNewGroup);
}

TEST_P(Allocations, TheShareLevelsAndAnyNumberFromZeroAreShares) {
  for (const int64_t shares : {-2, -3, -4, 0, 1, 1000000}) {
    EXPECT_EQ(set({"shares=" + std::to_string(shares)}), kSuccess) << shares;
    EXPECT_EQ(get().shares, shares);
  }
}

TEST_P(Allocations, AnyOtherNegativeNumberIsABadParameter) {
  for (const char *setting : {"min=-2", "min=-1000", "max=-2", "max=-3", "minLimit=-2", "shares=-1",
                              "shares=-5", "shares=-1000"}) {
    expectRefused({setting});
  }
}

TEST_P(Allocations, AMinAboveTheMaxIsABadParameter) {
  expectRefused({"min=21", "max=20"});
  ASSERT_EQ(set({"max=20"}), kSuccess);
  expectRefused({"min=21"});
  ASSERT_EQ(set({"min=20"}), kSuccess);
  expectRefused({"max=19"});
  EXPECT_EQ(set({"min=0", "max=0"}), kSuccess);
}

TEST_P(Allocations, AnEntryThatIsNoKeyAndDecimalIsABadParameter) {
  for (const char *entry : {"",
                            "min",
                            "=",
                            "=5",
                            "min=",
                            "min=x",
                            "min=5x",
                            "min= 5",
                            "min=5 ",
                            " min=5",
                            "min =5",
                            "min=+5",
                            "min=0x5",
                            "min=5.0",
                            "min=1e3",
                            "min==5",
                            "min=--5",
                            "min=-",
                            "min:5",
                            "Min=5",
                            "MIN=5",
                            "mins=5",
                            "minlimit=5",
                            "reservation=5",
                            "min=99999999999999999999",
                            "min=-99999999999999999999",
                            "min=5,max=6",
                            "min=5\n"}) {
    expectRefused({entry});
  }
}

TEST_P(Allocations, ASettingGivenTwiceIsABadParameterEvenWithTheSameNumber) {
  expectRefused({"min=5", "min=5"});
  expectRefused({"shares=5", "max=6", "shares=7"});
}

TEST_P(Allocations, NoSettingAtAllIsABadParameter) {
  expectRefused({});
}

TEST_P(Allocations, OneBadEntryAmongGoodOnesChangesNothing) {
  expectRefused({"min=5", "max=50", "minLimit=40", "shares=bad"});
  expectRefused({"bad", "min=5"});
  expectRefused({"min=5", "max=50", "shares=-9"});
}

TEST_P(Allocations, LeadingZerosAreDecimals) {
  EXPECT_EQ(set({"min=007", "max=-1"}), kSuccess);
  EXPECT_EQ(get().min, 7);
}

TEST_P(Allocations, TheLargestNumberOfTheRecordIsALimitLikeAnyOther) {
  const bool isCpu = GetParam().name == std::string("Cpu");
  const int64_t most = isCpu ? INT32_MAX : INT64_MAX;
  const std::string text = std::to_string(most);
  EXPECT_EQ(set({"max=" + text, "minLimit=" + text, "shares=" + text}), kSuccess);
  EXPECT_EQ(get(), (Settings{0, most, most, most}));
  EXPECT_EQ(set({"min=" + text}), kReservationRefused);
}

using CpuAllocations = ContractTest;

TEST_F(CpuAllocations, ANumberBeyond32BitsIsABadParameter) {
  const int64_t group = newGroup("host/opt", "pool");
  EXPECT_EQ(setCpu(group, {"max=2147483648"}), kBadParameter);
  EXPECT_EQ(setCpu(group, {"min=-2147483649"}), kBadParameter);
  EXPECT_EQ(cpu(group).value, kNewGroup);
}

using BothAllocations = ContractTest;

TEST_F(BothAllocations, MemoryAndCpuAreApart) {
  const int64_t group = newGroup("host/opt", "pool");
  ASSERT_EQ(setMemory(group, {"min=10", "shares=5"}), kSuccess);
  ASSERT_EQ(setCpu(group, {"max=50"}), kSuccess);
  EXPECT_EQ(memory(group).value, (Settings{10, -1, -1, 5}));
  EXPECT_EQ(cpu(group).value, (Settings{0, 50, -1, -3}));
}

using FixedGroups = ContractTest;

TEST_F(FixedGroups, CannotBeDisabled) {
  for (const char *path : {"host", "host/opt"}) {
    const int64_t id = idOf(path);
    EXPECT_EQ(setMemory(id, {"min=0", "max=0", "minLimit=0", "shares=0"}), kPermissionDenied);
    EXPECT_EQ(memory(id).value, kNewGroup);
    EXPECT_EQ(setMemory(id, {"max=1000"}), kSuccess);
    EXPECT_EQ(setMemory(id, {"max=-1"}), kSuccess);
  }
}

}  // namespace
}  // namespace Contract
