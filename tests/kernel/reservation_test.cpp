// SPDX-License-Identifier: Apache-2.0
// What makes a reservation worth something: it fits the group, every group above it and the
// machine, or it is refused and nothing changes.
#include "contract_test.h"

namespace Contract {
namespace {

struct ResourceCalls {
  const char *name;
  KNOB_ReturnStatus (*set)(int64_t, const Texts &);
  Answer<Settings> (*get)(int64_t);
  int64_t machine;  // how much there is to reserve
};

class Reservation : public ContractTest, public testing::WithParamInterface<ResourceCalls> {
 protected:
  Reservation()
      : parent_(newGroup("host/opt", "parent")),
        first_(newGroup("host/opt/parent", "first")),
        second_(newGroup("host/opt/parent", "second")) {}

  KNOB_ReturnStatus set(int64_t id, const Texts &settings) { return GetParam().set(id, settings); }
  KNOB_ReturnStatus setMin(int64_t id, int64_t min) {
    return set(id, {"min=" + std::to_string(min)});
  }
  Settings get(int64_t id) { return GetParam().get(id).value; }
  int64_t machine() const { return GetParam().machine; }

  const int64_t parent_, first_, second_;
};

INSTANTIATE_TEST_SUITE_P(Of, Reservation,
                         testing::Values(ResourceCalls{"Memory", setMemory, memory, kMemoryMB},
                                         ResourceCalls{"Cpu", setCpu, cpu, 100 * kCpus}),
                         [](const auto &resource) { return std::string(resource.param.name); });

TEST_P(Reservation, OwnMinLimitRefusesWhatIsAboveItAndChangesNothing) {
  ASSERT_EQ(set(first_, {"minLimit=10"}), kSuccess);
  EXPECT_EQ(setMin(first_, 11), kReservationRefused);
  EXPECT_EQ(get(first_), (Settings{0, -1, 10, -3}));
  EXPECT_EQ(setMin(first_, 10), kSuccess);
}

TEST_P(Reservation, MinAndLimitAreJudgedAsTheyAreAfterTheCall) {
  EXPECT_EQ(set(first_, {"min=11", "minLimit=10"}), kReservationRefused);
  EXPECT_EQ(get(first_), kNewGroup);
  EXPECT_EQ(set(first_, {"min=11", "minLimit=11"}), kSuccess);
  EXPECT_EQ(set(first_, {"minLimit=10"}), kReservationRefused);
  EXPECT_EQ(set(first_, {"minLimit=10", "min=10"}), kSuccess);
}

TEST_P(Reservation, ParentMinLimitRefusesTheSumOfItsChildren) {
  ASSERT_EQ(set(parent_, {"minLimit=20"}), kSuccess);
  ASSERT_EQ(setMin(first_, 15), kSuccess);
  EXPECT_EQ(setMin(second_, 6), kReservationRefused);
  EXPECT_EQ(get(second_), kNewGroup);
  EXPECT_EQ(setMin(second_, 5), kSuccess);
}

TEST_P(Reservation, ParentMaxRefusesTheSumOfItsChildren) {
  ASSERT_EQ(set(parent_, {"max=20"}), kSuccess);
  ASSERT_EQ(setMin(first_, 15), kSuccess);
  EXPECT_EQ(setMin(second_, 6), kReservationRefused);
  EXPECT_EQ(get(second_), kNewGroup);
  EXPECT_EQ(setMin(second_, 5), kSuccess);
}

TEST_P(Reservation, ALimitBelowWhatTheChildrenReserveIsRefused) {
  ASSERT_EQ(setMin(first_, 15), kSuccess);
  for (const Texts &settings : {Texts{"max=14"}, Texts{"minLimit=14"}}) {
    EXPECT_EQ(set(parent_, settings), kReservationRefused) << testing::PrintToString(settings);
  }
  EXPECT_EQ(get(parent_), kNewGroup);
  EXPECT_EQ(set(parent_, {"max=15", "minLimit=15"}), kSuccess);
}

// A command that waits for a busy group would report a refusal at once.
TEST_P(Reservation, DisablingAGroupAboveReservationsIsBusy) {
  ASSERT_EQ(setMin(first_, 15), kSuccess);
  for (const Texts &settings :
       {Texts{"min=0", "max=0"}, Texts{"min=0", "max=0", "minLimit=0", "shares=0"}}) {
    EXPECT_EQ(set(parent_, settings), kBusy) << testing::PrintToString(settings);
  }
  EXPECT_EQ(get(parent_), kNewGroup);
  ASSERT_EQ(setMin(first_, 0), kSuccess);
  EXPECT_EQ(set(parent_, {"min=0", "max=0"}), kSuccess);
}

TEST_P(Reservation, AGroupFarAboveRefusesToo) {
  ASSERT_EQ(set(idOf("host/opt"), {"minLimit=10"}), kSuccess);
  EXPECT_EQ(setMin(first_, 11), kReservationRefused);
  EXPECT_EQ(setMin(first_, 10), kSuccess);
  EXPECT_EQ(setMin(second_, 1), kReservationRefused);
}

TEST_P(Reservation, TheMachineIsTheLastLimit) {
  EXPECT_EQ(setMin(first_, machine() + 1), kReservationRefused);
  EXPECT_EQ(get(first_), kNewGroup);
  EXPECT_EQ(setMin(first_, machine()), kSuccess);
  EXPECT_EQ(setMin(second_, 1), kReservationRefused);
  EXPECT_EQ(get(second_), kNewGroup);
}

TEST_P(Reservation, HostItselfCannotReserveMoreThanTheMachine) {
  const int64_t host = idOf("host");
  EXPECT_EQ(setMin(host, machine() + 1), kReservationRefused);
  EXPECT_EQ(setMin(host, machine()), kSuccess);
  EXPECT_EQ(setMin(first_, machine()), kSuccess) << "it lies within what host reserves anyway";
}

TEST_P(Reservation, AParentsOwnMinAndItsChildrenShareOneReservation) {
  ASSERT_EQ(set(idOf("host/opt"), {"minLimit=100"}), kSuccess);
  ASSERT_EQ(setMin(parent_, 100), kSuccess);
  EXPECT_EQ(setMin(first_, 60), kSuccess);
  EXPECT_EQ(setMin(second_, 40), kSuccess);
  EXPECT_EQ(setMin(second_, 41), kReservationRefused);
  EXPECT_EQ(get(second_).min, 40);
}

TEST_P(Reservation, TheLargerOfOwnMinAndChildrenCounts) {
  const int64_t uncle = newGroup("host/opt", "uncle");
  ASSERT_EQ(set(idOf("host/opt"), {"minLimit=100"}), kSuccess);
  ASSERT_EQ(setMin(parent_, 30), kSuccess);
  ASSERT_EQ(setMin(first_, 70), kSuccess);
  EXPECT_EQ(setMin(uncle, 31), kReservationRefused);
  EXPECT_EQ(setMin(uncle, 30), kSuccess);
  ASSERT_EQ(setMin(first_, 0), kSuccess);
  EXPECT_EQ(setMin(uncle, 71), kReservationRefused) << "the parent's own min is still there";
  EXPECT_EQ(setMin(uncle, 70), kSuccess);
}

TEST_P(Reservation, WhatIsGivenUpCanBeTakenByAnother) {
  ASSERT_EQ(setMin(first_, machine()), kSuccess);
  ASSERT_EQ(setMin(second_, 10), kReservationRefused);
  ASSERT_EQ(setMin(first_, machine() - 10), kSuccess);
  EXPECT_EQ(setMin(second_, 10), kSuccess);
}

TEST_P(Reservation, SumsThatNoNumberCanHoldAreRefused) {
  const std::string most =
      std::to_string(GetParam().name == std::string("Cpu") ? INT32_MAX : INT64_MAX);
  ASSERT_EQ(setMin(first_, 1), kSuccess);
  EXPECT_EQ(set(second_, {"min=" + most}), kReservationRefused);
  EXPECT_EQ(set(first_, {"min=" + most}), kReservationRefused);
  EXPECT_EQ(get(first_).min, 1);
}

TEST_P(Reservation, ManySiblingsFillTheMachineExactly) {
  for (int64_t i = 0; i < machine() / 16; ++i) {
    ASSERT_EQ(setMin(newGroup("host/opt", "pool" + std::to_string(i)), 16), kSuccess) << i;
  }
  EXPECT_EQ(setMin(first_, 1), kReservationRefused);
}

TEST_P(Reservation, AMaxReservesNothing) {
  EXPECT_EQ(set(first_, {"max=" + std::to_string(machine() * 2)}), kSuccess);
  EXPECT_EQ(setMin(second_, machine()), kSuccess);
}

// Random changes, compared with a model that counts everything again each time.
TEST_P(Reservation, AgreesWithACountOfTheWholeTreeAfterRandomChanges) {
  struct Group {
    int64_t id;
    size_t parent;
    int64_t min = 0, minLimit = -1;
  };
  std::vector<Group> groups = {
      {idOf("host"), SIZE_MAX}, {idOf("host/opt"), 0}, {parent_, 1}, {first_, 2}, {second_, 2}};
  const auto fits = [&] {
    std::vector<int64_t> sums(groups.size(), 0);
    for (size_t i = groups.size(); i-- > 0;) {
      const int64_t reservation = std::max(groups[i].min, sums[i]);
      if (groups[i].minLimit != -1 && reservation > groups[i].minLimit) return false;
      if (i == 0) return reservation <= machine();
      sums[groups[i].parent] += reservation;
    }
    return true;
  };
  uint32_t random = 12345;
  const auto next = [&random](uint32_t below) {
    random = random * 1664525 + 1013904223;
    return static_cast<int64_t>((random >> 8) % below);
  };
  for (int round = 0; round < 400; ++round) {
    Group &group = groups[static_cast<size_t>(next(5))];
    const Group before = group;
    group.min = next(static_cast<uint32_t>(machine() + machine() / 4));
    group.minLimit = next(3) == 0 ? next(static_cast<uint32_t>(machine())) : -1;
    const bool good = fits();
    ASSERT_EQ(set(group.id, {"min=" + std::to_string(group.min),
                             "minLimit=" + std::to_string(group.minLimit)}),
              good ? kSuccess : kReservationRefused)
        << round;
    if (!good) group = before;
    ASSERT_EQ(get(group.id).min, group.min);
  }
}

}  // namespace
}  // namespace Contract
