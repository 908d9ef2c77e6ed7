// SPDX-License-Identifier: Apache-2.0
// The record of a group as bytes.
#include "knob/linux/record.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "knob/linux/control_values.h"

namespace Knob::Linux {
namespace {

Record sample() {
  Record record;
  record.memory = {{10, 200, 30, -4}, 17};
  record.cpu = {{5, 600, -1, 1000}, 3};
  record.peaks = {10240, 99999999999};
  record.cpuChildren = {7, 900, {1 << 20, 1 << 19, 1024}};
  return record;
}

std::string bytesOf(const Record &record) {
  const RecordBytes bytes = encode(record);
  return {bytes.data(), bytes.size()};
}

// The numbers follow version and flags, 8 bytes each.
std::string withNumber(size_t index, int64_t number) {
  std::string bytes = bytesOf(sample());
  std::memcpy(bytes.data() + 8 + 8 * index, &number, sizeof(number));
  return bytes;
}

TEST(Record, ReadsBackAsItWasWritten) {
  const auto record = decode(bytesOf(sample()));
  ASSERT_TRUE(record);
  EXPECT_EQ(record->memory.allocation.min, 10);
  EXPECT_EQ(record->memory.allocation.max, 200);
  EXPECT_EQ(record->memory.allocation.minLimit, 30);
  EXPECT_EQ(record->memory.allocation.shares, -4);
  EXPECT_EQ(record->memory.childrenSum, 17);
  EXPECT_EQ(record->cpu.allocation.min, 5);
  EXPECT_EQ(record->cpu.allocation.max, 600);
  EXPECT_EQ(record->cpu.allocation.minLimit, -1);
  EXPECT_EQ(record->cpu.allocation.shares, 1000);
  EXPECT_EQ(record->cpu.childrenSum, 3);
  EXPECT_EQ(record->peaks.ownReservedPeakKB, 10240U);
  EXPECT_EQ(record->peaks.childrenReservedPeakKB, 99999999999U);
  EXPECT_EQ(record->cpuChildren, sample().cpuChildren);
  EXPECT_FALSE(record->savedHigh);
}

TEST(Record, ANewGroupsReadsBackToo) {
  EXPECT_EQ(bytesOf(*decode(bytesOf(Record()))), bytesOf(Record()));
}

TEST(Record, TheEndsOfEveryRangeReadBack) {
  constexpr int64_t kMax = std::numeric_limits<int64_t>::max();
  Record record;
  record.memory = {{kMax, kMax, kMax, kMax}, kMax};
  record.peaks = {kUnlimited, kUnlimited};
  record.savedHigh = kUnlimited;
  const auto again = decode(bytesOf(record));
  ASSERT_TRUE(again);
  EXPECT_EQ(bytesOf(*again), bytesOf(record));
  EXPECT_EQ(again->savedHigh, kUnlimited);
}

TEST(Record, ASavedLimitOf0IsNotMissing) {
  Record record = sample();
  record.savedHigh = 0;
  const auto again = decode(bytesOf(record));
  ASSERT_TRUE(again);
  EXPECT_EQ(again->savedHigh, 0U);
}

TEST(Record, AnotherSizeIsDamaged) {
  const std::string bytes = bytesOf(sample());
  EXPECT_FALSE(decode(""));
  EXPECT_FALSE(decode(bytes.substr(1)));
  EXPECT_FALSE(decode(bytes + '\0'));
}

TEST(Record, AnotherVersionIsDamaged) {
  for (const char version : {'\0', '\1', '\3', '\x7f'}) {
    std::string bytes = bytesOf(sample());
    bytes[0] = version;
    EXPECT_FALSE(decode(bytes)) << int{version};
  }
}

TEST(Record, OfVersion1HasNoSumsForCpuWeights) {
  std::string bytes = bytesOf(sample()).substr(0, 112);
  bytes[0] = 1;
  const auto record = decode(bytes);
  ASSERT_TRUE(record);
  EXPECT_EQ(record->cpu.childrenSum, 3);
  EXPECT_EQ(record->cpuChildren, CpuChildren());
  bytes[0] = 2;
  EXPECT_FALSE(decode(bytes));
}

TEST(Record, UnknownFlagsAreDamaged) {
  std::string bytes = bytesOf(sample());
  bytes[4] = 2;
  EXPECT_FALSE(decode(bytes));
}

TEST(Record, ValuesThatNoOperationWritesAreDamaged) {
  EXPECT_FALSE(decode(withNumber(0, -1))) << "memory min";
  EXPECT_FALSE(decode(withNumber(0, 201))) << "memory min above max";
  EXPECT_FALSE(decode(withNumber(1, -2))) << "memory max";
  EXPECT_FALSE(decode(withNumber(2, -2))) << "memory minLimit";
  EXPECT_FALSE(decode(withNumber(3, -1))) << "memory shares";
  EXPECT_FALSE(decode(withNumber(4, -1))) << "memory sum";
  EXPECT_FALSE(decode(withNumber(5, 601))) << "CPU min above max";
  EXPECT_FALSE(decode(withNumber(8, -5))) << "CPU shares";
  EXPECT_FALSE(decode(withNumber(9, -1))) << "CPU sum";
  EXPECT_FALSE(decode(withNumber(13, -1))) << "number of children";
  EXPECT_FALSE(decode(withNumber(14, 70001))) << "weight of seven children";
  EXPECT_TRUE(decode(withNumber(4, 0)));
  EXPECT_TRUE(decode(withNumber(14, 70000)));
}

}  // namespace
}  // namespace Knob::Linux
