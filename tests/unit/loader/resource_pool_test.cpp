// SPDX-License-Identifier: Apache-2.0
// How one mapping of a definition file becomes a pool record.
#include "loader/resource_pool.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <string>
#include <type_traits>

#include "fake_knob.h"
#include "fake_store.h"
#include "yaml_support.h"

namespace {

using BadString = YAML::TypedBadConversion<std::string>;
using BadFloat = YAML::TypedBadConversion<float>;
using BadBool = YAML::TypedBadConversion<bool>;
using Loader::ResourcePoolImpl;

constexpr int64_t kLowest64 = std::numeric_limits<int64_t>::min();
constexpr int32_t kLowest32 = std::numeric_limits<int32_t>::min();

static_assert(!std::is_polymorphic_v<ResourcePoolImpl>);

ResourcePoolImpl pool(const std::string &text) {
  return ResourcePoolImpl(yaml(text));
}

// A pool of that name alone and one more key.
ResourcePoolImpl poolWith(const std::string &entry) {
  return pool("name: a\n" + entry + "\n");
}

void expectMem(const ResourcePoolImpl &actual, int64_t min, int64_t max, int64_t shares,
               int64_t minLimit) {
  EXPECT_EQ(min, int64_t{actual.mem.min});
  EXPECT_EQ(max, int64_t{actual.mem.max});
  EXPECT_EQ(shares, int64_t{actual.mem.shares});
  EXPECT_EQ(minLimit, int64_t{actual.mem.minLimit});
}

void expectCpu(const ResourcePoolImpl &actual, int32_t min, int32_t max, int32_t shares) {
  EXPECT_EQ(min, int32_t{actual.cpu.min});
  EXPECT_EQ(max, int32_t{actual.cpu.max});
  EXPECT_EQ(shares, int32_t{actual.cpu.shares});
  EXPECT_EQ(-1, int32_t{actual.cpu.minLimit});
}

template <typename Error>
void expectRefused(const std::string &text, Place place, const std::string &message) {
  SCOPED_TRACE(text);
  expectError<Error>([&] { pool(text); }, place, message);
}

int64_t memMax(const std::string &value) {
  return poolWith("memMax: " + value).mem.max;
}

int32_t cpuMax(const std::string &value) {
  return poolWith("cpuMax: " + value).cpu.max;
}

// ---- the record

TEST(Pool, HasDefaultsForAllButItsName) {
  const ResourcePoolImpl made = pool("name: a");
  EXPECT_EQ("host/opt/a", made.name);
  EXPECT_TRUE(made.isEnabled);
  expectMem(made, 0, -1, -1, -1);
  expectCpu(made, 0, -1, 1000);
}

TEST(Pool, KeepsTheKeysThatAreGiven) {
  const ResourcePoolImpl made = pool("{name: web, memMin: 512, cpuShares: 2000}");
  EXPECT_EQ("host/opt/web", made.name);
  EXPECT_TRUE(made.isEnabled);
  expectMem(made, 512, -1, -1, -1);
  expectCpu(made, 0, -1, 2000);
}

TEST(Pool, EachKeySetsItsOwnMember) {
  expectMem(poolWith("mem: 5"), 5, 5, -1, -1);
  expectMem(poolWith("memMin: 5"), 5, -1, -1, -1);
  expectMem(poolWith("memMax: 5"), 0, 5, -1, -1);
  expectMem(poolWith("memMinLimit: 5"), 0, -1, -1, 5);
  expectMem(poolWith("memShares: 5"), 0, -1, 5, -1);
  expectCpu(poolWith("cpuMin: 5"), 5, -1, 1000);
  expectCpu(poolWith("cpuMax: 5"), 0, 5, 1000);
  expectCpu(poolWith("cpuShares: 5"), 0, -1, 5);
}

TEST(Pool, MemoryKeysLeaveTheCpuAloneAndTheOtherWayRound) {
  expectCpu(pool("{name: a, mem: 5, memMinLimit: 6, memShares: 7}"), 0, -1, 1000);
  expectMem(pool("{name: a, cpuMin: 5, cpuMax: 6, cpuShares: 7}"), 0, -1, -1, -1);
}

TEST(Pool, DisabledPoolIsOtherwiseTheSame) {
  const ResourcePoolImpl made = pool("{name: a, isEnabled: false, mem: 7}");
  EXPECT_FALSE(made.isEnabled);
  EXPECT_EQ("host/opt/a", made.name);
  expectMem(made, 7, 7, -1, -1);
  expectCpu(made, 0, -1, 1000);
}

TEST(Pool, RecordIsPackedInTheOrderOfItsMembers) {
  const ResourcePoolImpl made = pool("name: a");
  const auto offset = [&made](const auto &member) {
    return reinterpret_cast<const char *>(&member) - reinterpret_cast<const char *>(&made);
  };
  constexpr std::ptrdiff_t kName = sizeof(std::string);
  EXPECT_EQ(0, offset(made.name));
  EXPECT_EQ(kName, offset(made.isEnabled));
  EXPECT_EQ(kName + 1, offset(made.mem));
  EXPECT_EQ(kName + 1 + 36, offset(made.cpu));
}

// ---- the order of keys

TEST(Pool, LaterMemMaxLeavesTheMinimumOfMem) {
  expectMem(pool("{name: a, mem: 100, memMax: 200}"), 100, 200, -1, -1);
  expectMem(pool("{name: a, mem: 100, memMin: 50}"), 50, 100, -1, -1);
}

TEST(Pool, LaterMemSetsBoth) {
  expectMem(pool("{name: a, memMax: 200, memMin: 1, mem: 100}"), 100, 100, -1, -1);
}

TEST(Pool, KeyGivenTwiceTakesItsLastValue) {
  const ResourcePoolImpl made =
      pool("{name: a, mem: 1, name: b, mem: 2, isEnabled: no, isEnabled: yes}");
  EXPECT_EQ("host/opt/b", made.name);
  EXPECT_TRUE(made.isEnabled);
  expectMem(made, 2, 2, -1, -1);
}

TEST(Pool, NameMayComeLast) {
  EXPECT_EQ("host/opt/z", pool("{mem: 1, name: z}").name);
}

TEST(Pool, FirstFaultInTheDocumentIsReported) {
  expectRefused<Loader::Exception>("name: a\nbogus: 1\nmem: x\n", {2, 1}, "invalid rp field");
  expectRefused<BadFloat>("name: a\nmem: x\nbogus: 1\n", {2, 6}, "bad conversion");
}

// ---- numbers

TEST(PoolNumber, PassesThroughSinglePrecision) {
  EXPECT_EQ(16777216, memMax("16777217"));
  EXPECT_EQ(16777216, cpuMax("16777217"));
  EXPECT_EQ(16777218, memMax("16777218"));
}

TEST(PoolNumber, IsCutTowardZero) {
  EXPECT_EQ(50, cpuMax("50.9"));
  EXPECT_EQ(-50, cpuMax("-50.9"));
  EXPECT_EQ(0, int64_t{poolWith("memMin: -0.5").mem.min});
  EXPECT_EQ(0, memMax("0.999"));
}

TEST(PoolNumber, MayBeNegative) {
  EXPECT_EQ(-3, int64_t{poolWith("memShares: -3").mem.shares});
  EXPECT_EQ(-4, int32_t{poolWith("cpuShares: -4").cpu.shares});
}

TEST(PoolNumber, InfinityAndNotANumberGiveTheLowestValue) {
  for (const char *text : {".inf", "-.inf", ".nan", "!calc 1 / 0", "!calc -1 / 0", "!calc 0 / 0"}) {
    EXPECT_EQ(kLowest64, memMax(text)) << text;
    EXPECT_EQ(kLowest32, cpuMax(text)) << text;
  }
}

TEST(PoolNumber, MemoryTakesEveryFloatBelowTheTopOfItsRange) {
  EXPECT_EQ(9223371487098961920, memMax("9223371487098961920"));
  EXPECT_EQ(-9223371487098961920, memMax("-9223371487098961920"));
  EXPECT_EQ(kLowest64, memMax("-9223372036854775808"));
}

TEST(PoolNumber, MemoryOutOfRangeGivesTheLowestValue) {
  for (const char *text : {"9223372036854775807", "1e19", "-1e19", "3e38", "-3e38"}) {
    EXPECT_EQ(kLowest64, memMax(text)) << text;
  }
}

TEST(PoolNumber, CpuTakesEveryFloatBelowTheTopOfItsRange) {
  EXPECT_EQ(2147483520, cpuMax("2147483520"));
  EXPECT_EQ(-2147483520, cpuMax("-2147483520"));
  EXPECT_EQ(kLowest32, cpuMax("-2147483648"));
}

// 2^40 is a float; cut to 32 bits it would be 0.
TEST(PoolNumber, EveryMemoryKeyHasSixtyFourBits) {
  constexpr int64_t kBig = int64_t{1} << 40;
  expectMem(poolWith("mem: 1099511627776"), kBig, kBig, -1, -1);
  expectMem(poolWith("memMin: 1099511627776"), kBig, -1, -1, -1);
  expectMem(poolWith("memMax: 1099511627776"), 0, kBig, -1, -1);
  expectMem(poolWith("memMinLimit: 1099511627776"), 0, -1, -1, kBig);
  expectMem(poolWith("memShares: 1099511627776"), 0, -1, kBig, -1);
}

TEST(PoolNumber, EveryCpuKeyOutOfRangeGivesTheLowestValue) {
  expectCpu(poolWith("cpuMin: 1099511627776"), kLowest32, -1, 1000);
  expectCpu(poolWith("cpuMax: 1099511627776"), 0, kLowest32, 1000);
  expectCpu(poolWith("cpuShares: 1099511627776"), 0, -1, kLowest32);
}

TEST(PoolNumber, CpuOutOfRangeGivesTheLowestValue) {
  for (const char *text :
       {"2147483647", "2147483648", "4294967296", "-2147483904", "1e10", "-1e10"}) {
    EXPECT_EQ(kLowest32, cpuMax(text)) << text;
  }
}

TEST(PoolNumber, MayBeAnExpressionOverTheHostsFacts) {
  EXPECT_EQ(16384, memMax("!calc physKB / 1024"));
  EXPECT_EQ(800, cpuMax("!calc {each: 100, =: numPCPUs * each}"));
}

TEST(PoolNumber, MayComeFromTheConfigurationStore) {
  FakeStore::instance().reset();
  const std::string value = "!config {object: [host, pools, backup], key: sizeMB, default: 1024}";
  EXPECT_EQ(1024, memMax(value));
  FakeStore::instance().objects["backup/host/pools/"] = {{"sizeMB", 2048L}};
  EXPECT_EQ(2048, memMax(value));
}

// ---- the flag

TEST(PoolFlag, MayBeAnExpression) {
  EXPECT_TRUE(poolWith("isEnabled: !calc not isVm").isEnabled);
  EXPECT_FALSE(poolWith("isEnabled: !calc isInstaller").isEnabled);
}

TEST(PoolFlag, IsReadInTheYamlLibrarysWords) {
  EXPECT_FALSE(poolWith("isEnabled: off").isEnabled);
  EXPECT_TRUE(poolWith("isEnabled: Yes").isEnabled);
}

TEST(PoolFlag, ThatIsNoTruthValueIsABadConversion) {
  expectRefused<BadBool>("name: a\nisEnabled: 1\n", {2, 12}, "bad conversion");
}

// ---- the name

TEST(PoolName, IsPutBelowHostOptUnlessItIsAFullPath) {
  EXPECT_EQ("host/x", pool("name: host/x").name);
  EXPECT_EQ("host/opt/host", pool("name: host").name);
  EXPECT_EQ("host/opt/hostx/y", pool("name: hostx/y").name);
  EXPECT_EQ("host/", pool("name: host/").name);
  EXPECT_EQ("host/opt/Host/x", pool("name: Host/x").name);
  EXPECT_EQ("host/opt//host/x", pool("name: /host/x").name);
}

TEST(PoolName, IsKeptAsWritten) {
  EXPECT_EQ("host/opt/a b//c/", pool("name: a b//c/").name);
  EXPECT_EQ("host/opt/x/host/opt/y", pool("name: x/host/opt/y").name);
  EXPECT_EQ("host/opt/ a ", pool("name: ' a '").name);
  EXPECT_EQ("host/opt/5", pool("name: 5").name);
  EXPECT_EQ("host/opt/" + std::string(5000, 'n'), pool("name: " + std::string(5000, 'n')).name);
}

TEST(PoolName, IsNeverEvaluated) {
  EXPECT_EQ("host/opt/1 + 1", pool("name: !calc 1 + 1").name);
  EXPECT_EQ("host/opt/x", pool("name: !config x").name);
  EXPECT_EQ("host/opt/null", pool("name: 'null'").name);
}

TEST(PoolName, ThatIsMissingOrEmptyIsReportedAtTheItem) {
  expectRefused<Loader::Exception>("memMin: 5", {1, 1}, "rp missing name");
  expectRefused<Loader::Exception>("{}", {1, 1}, "rp missing name");
  expectRefused<Loader::Exception>("{mem: 1, name: ''}", {1, 1}, "rp missing name");
  expectRefused<Loader::Exception>("{name: a, name: \"\"}", {1, 1}, "rp missing name");
  const YAML::Node list = yaml("- name: a\n-  mem: 1\n");
  expectError<Loader::Exception>([&] { ResourcePoolImpl made(list[1]); }, {2, 4},
                                 "rp missing name");
}

TEST(PoolName, WithoutAValueIsABadConversion) {
  expectErrorAnywhere<BadString>([] { pool("name:\nmem: 1\n"); }, "bad conversion");
  for (const char *word : {"~", "null", "Null", "NULL"}) {
    expectRefused<BadString>(std::string("name: ") + word, {1, 7}, "bad conversion");
  }
}

TEST(PoolName, ThatIsNoScalarIsABadConversion) {
  expectRefused<BadString>("name: [a]", {1, 7}, "bad conversion");
  expectRefused<BadString>("name: {a: b}", {1, 7}, "bad conversion");
}

// ---- keys

TEST(PoolKey, ThatIsUnknownIsReportedAtTheKey) {
  for (const char *key : {"cpuMinLimit", "Name", "memory", "memmin", "NAME", "'mem '", "''"}) {
    expectRefused<Loader::Exception>("name: a\n" + std::string(key) + ": 1\n", {2, 1},
                                     "invalid rp field");
  }
}

TEST(PoolKey, ThatIsNoScalarIsABadConversionAtTheKey) {
  expectRefused<BadString>("name: a\n? [mem]\n: 1\n", {2, 3}, "bad conversion");
  expectRefused<BadString>("{name: a, {b: c}: 1}", {1, 11}, "bad conversion");
  expectRefused<BadString>("name: a\n~: 1\n", {2, 1}, "bad conversion");
}

TEST(PoolKey, MayBeQuotedOrTagged) {
  EXPECT_EQ(5, int64_t{poolWith("'memMin': 5").mem.min});
  EXPECT_EQ(5, int64_t{poolWith("!calc memMin: 5").mem.min});
}

// ---- values that do not convert

TEST(PoolValue, FaultsOfTheConversionPassUnchanged) {
  expectRefused<BadFloat>("name: a\nmem: 12 MB\n", {2, 6}, "bad conversion");
  expectRefused<Loader::Exception>("name: a\nmem: '5'\n", {2, 6}, "Unexpected tag !");
  expectRefused<Loader::Exception>("name: a\nmem: ~\n", {2, 6}, "Unexpected tag ");
  expectRefused<Loader::Exception>("name: a\nmem: [5]\n", {2, 6}, "Node is not a scalar.");
  expectRefused<Loader::Exception>("name: a\nmem: !calc foo\n", {2, 6},
                                   "unexpected symbol: foo at 'foo'");
  expectRefused<Loader::Exception>("name: a\nmem: !config {}\n", {2, 6}, "missing default");
}

TEST(PoolValue, EveryNumericKeyConverts) {
  for (const char *key : {"mem", "memMin", "memMax", "memMinLimit", "memShares", "cpuMin", "cpuMax",
                          "cpuShares", "isEnabled"}) {
    expectErrorAnywhere<Loader::Exception>([&] { poolWith(std::string(key) + ": !math 1"); },
                                           "Unexpected tag !math");
  }
}

// ---- items

TEST(PoolItem, ThatIsNoMappingIsReportedAtTheItem) {
  const std::string message = "expected a map";
  const YAML::Node list = yaml("- name: a\n- scalar\n-  [b]\n- ~\n- ''\n");
  const Place places[] = {{2, 3}, {3, 4}, {4, 3}, {5, 3}};
  for (int i = 0; i < 4; ++i) {
    expectError<Loader::Exception>([&] { ResourcePoolImpl made(list[i + 1]); }, places[i], message);
  }
  expectErrorAnywhere<Loader::Exception>(
      [] { ResourcePoolImpl made{YAML::Node(YAML::NodeType::Undefined)}; }, message);
}

TEST(PoolItem, ThatIsInvalidIsTheLibrarysPlainError) {
  expectError<YAML::InvalidNode>([] { ResourcePoolImpl made(invalidNode()); }, kNowhere,
                                 kInvalidNode);
}

TEST(PoolItem, EntryOfAMappingIsInvalidAsAnItem) {
  const YAML::Node mapping = yaml("{name: a}");
  for (const auto &entry : mapping) {
    expectError<YAML::InvalidNode>([&] { ResourcePoolImpl made(entry); }, kNowhere, kInvalidNode);
  }
}

TEST(PoolItem, TagOfTheMappingIsNotLookedAt) {
  EXPECT_EQ("host/opt/a", pool("!calc {name: a}").name);
}

TEST(ResourcePool, OfAnotherMachineAsksNoKernel) {
  const size_t before = FakeKnob::instance().calls.size();
  const ResourcePoolImpl read(yaml("{name: a, cpuMin: !calc numPCPUs * 2}"), {{"numPCPUs", 3.0F}});
  EXPECT_EQ(6, int32_t{read.cpu.min});
  EXPECT_EQ(before, FakeKnob::instance().calls.size());
}

TEST(ResourcePool, EachListedKeyIsTaken) {
  for (const std::string &key : Loader::poolKeys()) {
    const std::string value = key == "isEnabled" ? "true" : "1";
    EXPECT_NO_THROW(pool("{name: a, " + key + ": " + value + "}")) << key;
  }
  EXPECT_EQ(10U, Loader::poolKeys().size());
}

}  // namespace
