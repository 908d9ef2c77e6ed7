// SPDX-License-Identifier: Apache-2.0
// The peaks of a group's life, and the facts of the machine.
#include <array>
#include <cstring>

#include "contract_test.h"

namespace Contract {
namespace {

using Statistics = ContractTest;
using Facts = ContractTest;

TEST_F(Statistics, ANewGroupHasNoPeaks) {
  const int64_t id = newGroup("host/opt", "pool");
  EXPECT_EQ(peaks(id).value.ownKB, 0U);
  EXPECT_EQ(peaks(id).value.childrenKB, 0U);
}

TEST_F(Statistics, ThePeakOfTheOwnMinStaysWhenTheMinFalls) {
  const int64_t id = newGroup("host/opt", "pool");
  ASSERT_EQ(setMemory(id, {"min=100"}), kSuccess);
  ASSERT_EQ(setMemory(id, {"min=300"}), kSuccess);
  ASSERT_EQ(setMemory(id, {"min=200"}), kSuccess);
  EXPECT_EQ(peaks(id).value.ownKB, 300U * 1024);
  EXPECT_EQ(peaks(id).value.childrenKB, 0U);
}

TEST_F(Statistics, ThePeakOfTheChildrenIsThatOfTheirSum) {
  const int64_t parent = newGroup("host/opt", "parent");
  const int64_t first = newGroup("host/opt/parent", "first");
  const int64_t second = newGroup("host/opt/parent", "second");
  ASSERT_EQ(setMemory(first, {"min=100"}), kSuccess);
  ASSERT_EQ(setMemory(second, {"min=50"}), kSuccess);
  ASSERT_EQ(setMemory(first, {"min=0"}), kSuccess);
  ASSERT_EQ(setMemory(second, {"min=120"}), kSuccess);
  EXPECT_EQ(peaks(parent).value.childrenKB, 150U * 1024);
  EXPECT_EQ(peaks(parent).value.ownKB, 0U);
  EXPECT_EQ(peaks(idOf("host/opt")).value.childrenKB, 150U * 1024);
  EXPECT_EQ(peaks(idOf("host")).value.childrenKB, 150U * 1024);
}

TEST_F(Statistics, AParentsOwnMinIsNotItsChildrens) {
  const int64_t parent = newGroup("host/opt", "parent");
  const int64_t child = newGroup("host/opt/parent", "child");
  ASSERT_EQ(setMemory(parent, {"min=100"}), kSuccess);
  ASSERT_EQ(setMemory(child, {"min=10"}), kSuccess);
  EXPECT_EQ(peaks(parent).value.ownKB, 100U * 1024);
  EXPECT_EQ(peaks(parent).value.childrenKB, 10U * 1024);
  EXPECT_EQ(peaks(idOf("host/opt")).value.childrenKB, 100U * 1024);
}

TEST_F(Statistics, ARefusedSetLeavesNoPeak) {
  const int64_t id = newGroup("host/opt", "pool");
  ASSERT_EQ(setMemory(id, {"min=" + std::to_string(kMemoryMB + 1)}), kReservationRefused);
  EXPECT_EQ(peaks(id).value.ownKB, 0U);
  EXPECT_EQ(peaks(idOf("host")).value.childrenKB, 0U);
}

TEST_F(Statistics, ADeletedChildStaysInTheParentsPeak) {
  const int64_t parent = newGroup("host/opt", "parent");
  const int64_t child = newGroup("host/opt/parent", "child");
  ASSERT_EQ(setMemory(child, {"min=10"}), kSuccess);
  ASSERT_EQ(remove(child), kSuccess);
  EXPECT_EQ(peaks(parent).value.childrenKB, 10U * 1024);
}

TEST_F(Statistics, AGroupMadeAnewBeginsWithoutPeaks) {
  const int64_t id = newGroup("host/opt", "pool");
  ASSERT_EQ(setMemory(id, {"min=10"}), kSuccess);
  ASSERT_EQ(remove(id), kSuccess);
  EXPECT_EQ(peaks(newGroup("host/opt", "pool")).value.ownKB, 0U);
}

TEST_F(Statistics, CpuReservationsLeaveNoPeak) {
  const int64_t id = newGroup("host/opt", "pool");
  ASSERT_EQ(setCpu(id, {"min=100"}), kSuccess);
  EXPECT_EQ(peaks(id).value.ownKB, 0U);
  EXPECT_EQ(peaks(idOf("host/opt")).value.childrenKB, 0U);
}

template <typename T, size_t kSize>
T at(const std::array<char, kSize> &record, size_t offset) {
  T value;
  std::memcpy(&value, record.data() + offset, sizeof(value));
  return value;
}

TEST_F(Facts, TheCpuRecordHoldsTheCpusAndWhetherThisIsAVirtualMachine) {
  std::array<char, 38> record{};
  ASSERT_EQ(KNOB_Get(KNOB_NODE_hardware_cpu_cpuInfo, nullptr, record.data(), record.size()), 0U);
  EXPECT_EQ(at<uint32_t>(record, 24), static_cast<uint32_t>(kCpus));
  EXPECT_EQ(record[36], 1);
}

TEST_F(Facts, TheLimitsRecordHoldsTheMostVirtualMachines) {
  std::array<char, 32> record{};
  ASSERT_EQ(KNOB_Get(KNOB_NODE_system_vmLimits, nullptr, record.data(), record.size()), 0U);
  EXPECT_EQ(at<uint32_t>(record, 0), static_cast<uint32_t>(kMaxVms));
}

TEST_F(Facts, TheCommandLineEndsWithNul) {
  std::array<char, 4096> record;
  record.fill('x');
  ASSERT_EQ(KNOB_Get(KNOB_NODE_system_bootCmdLine, nullptr, record.data(), record.size()), 0U);
  EXPECT_STREQ(record.data(), kCommandLine);
}

TEST_F(Facts, TheMemoryRecordHoldsPhysicalMemoryInKB) {
  std::array<char, 80> record{};
  ASSERT_EQ(KNOB_Get(KNOB_NODE_memory_comprehensive, nullptr, record.data(), record.size()), 0U);
  EXPECT_EQ(at<uint64_t>(record, 0), uint64_t{kMemoryMB} * 1024);
}

TEST_F(Facts, ALargerBufferIsFilledOnlyAsFarAsTheRecordGoes) {
  std::array<char, 64> record;
  record.fill('x');
  ASSERT_EQ(KNOB_Get(KNOB_NODE_hardware_cpu_cpuInfo, nullptr, record.data(), record.size()), 0U);
  EXPECT_EQ(at<uint32_t>(record, 24), static_cast<uint32_t>(kCpus));
  EXPECT_EQ(record[38], 'x');
}

TEST_F(Facts, TheLibraryThatStartedTheKernelMatchesIt) {
  char build[21] = "untouched";
  const char *mine = nullptr;
  EXPECT_EQ(KNOB_CheckSig(build, sizeof(build), &mine), 0);
  EXPECT_STREQ(build, "untouched");
}

}  // namespace
}  // namespace Contract
