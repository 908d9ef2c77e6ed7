// SPDX-License-Identifier: Apache-2.0
// "!config" values through the whole program, with a configuration store that follows a script.
#include "cli_fixture.h"

namespace Test {
namespace {

class Config : public Cli {
 protected:
  // The memory minimum that the program makes of VALUE.
  std::string memMin(const std::string &value) {
    const ProcessResult result = list("memMin: " + value);
    EXPECT_EQ(result.err, "");
    return column(result.out, 2);
  }

  std::string isEnabled(const std::string &value) {
    const ProcessResult result = list("isEnabled: " + value);
    EXPECT_EQ(result.err, "");
    return column(result.out, 1);
  }

  ProcessResult list(const std::string &field) {
    return world.poolctl({"list", "-v", world.file("a.yaml", "- {name: a, " + field + "}\n")});
  }

  const std::string reference = "!config {object: [host, pools, backup], key: sizeMB, default: 9}";
  const std::string flag = "!config {object: [host, pools, backup], key: on, default: yes}";

 private:
  static std::string column(const std::string &out, size_t index) {
    std::istringstream line(lines(out).at(1));
    std::string value;
    for (size_t i = 0; i <= index; ++i) std::getline(line, value, ',');
    return value;
  }
};

TEST_F(Config, TheStoresValueReplacesTheDefault) {
  for (const char *line : {"store = here", "object host/pools/backup = here",
                           "field host/pools/backup sizeMB = integer 7"})
    world.config(line);
  EXPECT_EQ(memMin(reference), "7");
  EXPECT_EQ(world.configTrace(),
            (Calls{"GetStore \"scripted-global\"",
                   "GetObject key=\"backup\" component=\"host\" group=\"pools\" extra=\"\"",
                   "GetValue long \"sizeMB\""}));
}

TEST_F(Config, ARealValueIsReadByTheSecondRead) {
  for (const char *line : {"store = here", "object host/pools/backup = here",
                           "field host/pools/backup sizeMB = real 7.9"})
    world.config(line);
  EXPECT_EQ(memMin(reference), "7");
  EXPECT_EQ(world.configTrace().at(2), "GetValue long \"sizeMB\"");
  EXPECT_EQ(world.configTrace().at(3), "GetValue double \"sizeMB\"");
}

TEST_F(Config, PartsOfTheObjectThatAreNotGivenAreEmpty) {
  world.config("store = here");
  EXPECT_EQ(memMin("!config {object: {group: g}, key: k, default: 9}"), "9");
  EXPECT_EQ(world.configTrace().at(1), "GetObject key=\"\" component=\"\" group=\"g\" extra=\"\"");
}

TEST_F(Config, EveryFailureOfTheStoreLeavesTheDefault) {
  // The script is read line by line: the last word on each thing counts.
  EXPECT_EQ((world.config("nothing = here"), memMin(reference)), "9") << "no store";
  EXPECT_EQ((world.config("store = ConfigStoreException gone"), memMin(reference)), "9");
  EXPECT_EQ((world.config("store = here"), memMin(reference)), "9") << "no object";
  EXPECT_EQ((world.config("object host/pools/backup = ConfigStoreException no"), memMin(reference)),
            "9");
  EXPECT_EQ((world.config("object host/pools/backup = here"), memMin(reference)), "9")
      << "no field";
  EXPECT_EQ((world.config("field host/pools/backup sizeMB = text 5"), memMin(reference)), "9");
  EXPECT_EQ(
      (world.config("field host/pools/backup sizeMB = ConfigStoreException no"), memMin(reference)),
      "9");
}

TEST_F(Config, AnyOtherExceptionOfTheLookUpIsAnErrorAtTheNode) {
  world.config("store = runtime_error out of order");
  const ProcessResult result = list("memMin: " + reference);
  expectRun(result, 1, kCsvHeader,
            (world.folder() / "a.yaml").string() + ": line 1 column 21: out of order\n");
}

TEST_F(Config, ATruthValueIsWhetherTheNumberIsNotZero) {
  world.config("store = here");
  world.config("object host/pools/backup = here");
  for (const auto &[answer, expected] :
       {std::pair{"integer 7", "yes"}, std::pair{"integer 0", "no"}, std::pair{"real 0.5", "yes"},
        std::pair{"real -0.0", "no"}, std::pair{"real nan", "yes"}, std::pair{"text no", "yes"}}) {
    world.config(std::string("field host/pools/backup on = ") + answer);
    EXPECT_EQ(isEnabled(flag), expected) << answer;
  }
}

TEST_F(Config, ADefaultThatIsAReferenceIsLookedUpFirst) {
  for (const char *line : {"store = here", "object o/u/t = here", "object i/n/n = here",
                           "field o/u/t k = integer 1", "field i/n/n k = integer 2"})
    world.config(line);
  EXPECT_EQ(memMin("!config {object: [o, u, t], key: k, default: !config {object: [i, n, n], key: "
                   "k, default: 3}}"),
            "1");
  EXPECT_EQ(world.configTrace().at(1),
            "GetObject key=\"n\" component=\"i\" group=\"n\" extra=\"\"");
  EXPECT_EQ(world.configTrace().at(4),
            "GetObject key=\"t\" component=\"o\" group=\"u\" extra=\"\"");
}

TEST_F(Config, ADefaultMayBeAnExpression) {
  world.config("nothing = here");
  world.knob("cpus 8");
  EXPECT_EQ(memMin("!config {object: [a, b, c], key: k, default: !calc numPCPUs * 2}"), "16");
}

TEST_F(Config, EachValueMakesALookUpOfItsOwn) {
  world.config("store = here");
  list("memMin: " + reference + ", memMax: " + reference);
  EXPECT_EQ(world.configTrace().size(), 4u);
}

struct BadReference {
  const char *name, *yaml, *message;
};

class BadConfig : public testing::TestWithParam<BadReference> {};

TEST_P(BadConfig, IsReportedWithItsPlace) {
  StandInWorld world;
  world.config("nothing = here");
  const auto file =
      world.file("a.yaml", std::string("- name: a\n  mem: ") + GetParam().yaml + "\n");
  expectRun(world.poolctl({"list", "-v", file}), 1, kCsvHeader,
            file.string() + ": line 2 column " + GetParam().message + "\n");
  EXPECT_EQ(world.configTrace(), Calls{});
}

INSTANTIATE_TEST_SUITE_P(
    Each, BadConfig,
    testing::Values(
        BadReference{"NoMapping", "!config [a]", "8: invalid config specification"},
        BadReference{"Scalar", "!config a", "8: invalid config specification"},
        BadReference{"ExtraKey", "!config {object: [a, b, c], key: k, default: 1, comment: hi}",
                     "65: invalid config field"},
        BadReference{"NothingAtAll", "!config {}", "8: missing default"},
        BadReference{"NoDefault", "!config {object: [a, b, c]}", "8: missing default"},
        BadReference{"NoObject", "!config {default: 1}", "8: missing object"},
        BadReference{"NoKey", "!config {object: [a, b, c], default: 1}", "8: missing value"},
        BadReference{"EmptyKey", "!config {object: [a, b, c], key: '', default: 1}",
                     "8: missing value"},
        BadReference{"KeyThatIsNull", "!config {object: [a, b, c], key: ~, default: 1}",
                     "41: bad conversion"},
        BadReference{"ObjectThatIsAWord", "!config {object: a, key: k, default: 1}",
                     "25: invalid config object specification"},
        BadReference{"ObjectWithAnUnknownKey", "!config {object: {name: a}, key: k, default: 1}",
                     "26: invalid objectID field"},
        BadReference{"DefaultThatIsNoNumber", "!config {object: [a, b, c], key: k, default: x}",
                     "53: bad conversion"}),
    [](const auto &bad) { return std::string(bad.param.name); });

}  // namespace
}  // namespace Test
