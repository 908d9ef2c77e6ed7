// SPDX-License-Identifier: Apache-2.0
// References to the configuration store: their shape, what is asked of the store in which order,
// and when the default holds.
#include "configref/config_reference.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <new>
#include <stdexcept>
#include <string>
#include <vector>

#include "fake_store.h"
#include "platform/kestrel_config_store.h"
#include "yaml_support.h"

namespace {

using KestrelConfigStore::ConfigStoreException;
using KestrelConfigStore::InvalidTypeException;
using BadString = YAML::TypedBadConversion<std::string>;
using Calls = std::vector<std::string>;

const Calc::VariableTable kFacts = {{"numPCPUs", 8.0f}, {"isVm", 0.0f}};

class ConfigReference : public testing::Test {
 protected:
  ConfigReference() { store_.reset(); }

  // A well-formed reference to the field "size" of the object c, g, k.
  static std::string reference(const std::string &fallback) {
    return "!config {object: [c, g, k], key: size, default: " + fallback + "}";
  }

  void hold(FakeStore::Field value) { store_.objects["k/c/g/"]["size"] = std::move(value); }

  static float number(const std::string &text) { return ConfigToFloat(yaml(text), kFacts); }
  static bool flag(const std::string &text) { return ConfigToBool(yaml(text), kFacts); }

  // The reference is malformed in both readings, and the store is never asked.
  template <typename Error>
  void expectRefused(const std::string &text, Place place, const std::string &message) {
    SCOPED_TRACE(text);
    expectError<Error>([&] { number(text); }, place, message);
    expectError<Error>([&] { flag(text); }, place, message);
    EXPECT_EQ(Calls(), store_.calls);
  }

  FakeStore &store_ = FakeStore::instance();
};

// ---- values of the store

TEST_F(ConfigReference, IntegerIsTheValue) {
  hold(7L);
  EXPECT_EQ(7.0f, number(reference("1")));
  EXPECT_TRUE(flag(reference("no")));
}

TEST_F(ConfigReference, RealNumberIsTheValue) {
  hold(0.5);
  EXPECT_EQ(0.5f, number(reference("1")));
  EXPECT_TRUE(flag(reference("no")));
}

TEST_F(ConfigReference, ZeroIsFalse) {
  hold(0L);
  EXPECT_EQ(0.0f, number(reference("1")));
  EXPECT_FALSE(flag(reference("yes")));
  hold(-0.0);
  EXPECT_FALSE(flag(reference("yes")));
}

TEST_F(ConfigReference, EveryNonZeroNumberIsTrue) {
  for (const double value : {-1.0, 1e-300, std::numeric_limits<double>::infinity(), std::nan("")}) {
    hold(value);
    EXPECT_TRUE(flag(reference("no"))) << value;
  }
}

TEST_F(ConfigReference, NumberIsNarrowedToSinglePrecision) {
  hold(16777217L);
  EXPECT_EQ(16777216.0f, number(reference("1")));
  hold(0.1);
  EXPECT_EQ(0.1f, number(reference("1")));
  hold(1e300);
  EXPECT_EQ(std::numeric_limits<float>::infinity(), number(reference("1")));
  hold(1e-300);
  EXPECT_EQ(0.0f, number(reference("1")));
}

// Rounding 2^60 + 2^36 + 1 straight to a float would go up; by way of a double it is a tie.
TEST_F(ConfigReference, IntegerPassesThroughDoublePrecision) {
  hold((1L << 60) + (1L << 36) + 1);
  EXPECT_EQ(static_cast<float>(1L << 60), number(reference("1")));
  hold(std::numeric_limits<long>::min());
  EXPECT_EQ(-0x1p63f, number(reference("1")));
}

TEST_F(ConfigReference, NotANumberIsAValue) {
  hold(std::nan(""));
  EXPECT_TRUE(std::isnan(number(reference("1"))));
}

// ---- what is asked, and in which order

TEST_F(ConfigReference, AsksTheGlobalStoreForTheObjectAndTheInteger) {
  hold(7L);
  number(reference("1"));
  EXPECT_EQ((Calls{"GetStore " + KestrelConfigStore::sGlobalNamespace, "GetObject k/c/g/",
                   "GetValue long size"}),
            store_.calls);
}

TEST_F(ConfigReference, AsksForARealNumberWhenItIsNoInteger) {
  hold(0.5);
  flag(reference("no"));
  EXPECT_EQ((Calls{"GetStore " + KestrelConfigStore::sGlobalNamespace, "GetObject k/c/g/",
                   "GetValue long size", "GetValue double size"}),
            store_.calls);
}

TEST_F(ConfigReference, DoesNotAskAgainForAFieldThatIsMissing) {
  store_.objects["k/c/g/"] = {};
  number(reference("1"));
  EXPECT_EQ(3u, store_.calls.size());
}

TEST_F(ConfigReference, EachValueMakesItsOwnLookup) {
  hold(7L);
  number(reference("1"));
  hold(8L);
  EXPECT_EQ(8.0f, number(reference("1")));
  EXPECT_EQ(6u, store_.calls.size());
}

// ---- when the default holds

TEST_F(ConfigReference, MissingStoreGivesTheDefault) {
  store_.exists = false;
  EXPECT_EQ(1024.0f, number(reference("1024")));
  EXPECT_TRUE(flag(reference("yes")));
  EXPECT_FALSE(flag(reference("no")));
  EXPECT_EQ(Calls(3, "GetStore " + KestrelConfigStore::sGlobalNamespace), store_.calls);
}

TEST_F(ConfigReference, MissingObjectGivesTheDefault) {
  EXPECT_EQ(1024.0f, number(reference("1024")));
  EXPECT_TRUE(flag(reference("yes")));
}

TEST_F(ConfigReference, MissingFieldGivesTheDefault) {
  store_.objects["k/c/g/"] = {{"other", 5L}};
  EXPECT_EQ(1024.0f, number(reference("1024")));
  EXPECT_TRUE(flag(reference("yes")));
}

TEST_F(ConfigReference, RealReadWithoutAValueGivesTheDefault) {
  store_.objects["k/c/g/"] = {};
  store_.at = {{"GetValue long", [] { throw InvalidTypeException("another type"); }}};
  EXPECT_EQ(1024.0f, number(reference("1024")));
  EXPECT_TRUE(flag(reference("yes")));
  EXPECT_EQ("GetValue double size", store_.calls.back());
}

TEST_F(ConfigReference, FieldThatNeitherReadTakesGivesTheDefault) {
  hold("text");
  EXPECT_EQ(1024.0f, number(reference("1024")));
  EXPECT_TRUE(flag(reference("yes")));
  EXPECT_EQ("GetValue double size", store_.calls.back());
}

TEST_F(ConfigReference, FailureOfTheStoreAtAnyStepGivesTheDefault) {
  hold(0.5);
  for (const char *step : {"GetStore", "GetObject", "GetValue long", "GetValue double"}) {
    store_.at = {{step, [] { throw ConfigStoreException("the store is gone"); }}};
    EXPECT_EQ(1024.0f, number(reference("1024"))) << step;
    EXPECT_TRUE(flag(reference("yes"))) << step;
  }
}

TEST_F(ConfigReference, TypeErrorOutsideTheFirstReadGivesTheDefault) {
  hold(0.5);
  for (const char *step : {"GetStore", "GetObject", "GetValue double"}) {
    store_.at = {{step, [] { throw InvalidTypeException("another type"); }}};
    EXPECT_EQ(1024.0f, number(reference("1024"))) << step;
  }
}

TEST_F(ConfigReference, FailureThatIsNoTypeErrorIsNotReadAgain) {
  hold(7L);
  store_.at = {{"GetValue long", [] { throw ConfigStoreException("the store is gone"); }}};
  EXPECT_EQ(1024.0f, number(reference("1024")));
  EXPECT_EQ("GetValue long size", store_.calls.back());
}

// ---- failures that are not the store's

TEST_F(ConfigReference, ForeignFailureAtAnyStepIsReportedAtTheReference) {
  hold(0.5);
  for (const char *step : {"GetStore", "GetObject", "GetValue long", "GetValue double"}) {
    SCOPED_TRACE(step);
    store_.at = {{step, [] { throw std::runtime_error("no more files"); }}};
    const YAML::Node document = yaml("a: 1\nb: " + reference("!calc 1"));
    expectError<Loader::Exception>([&] { ConfigToFloat(document["b"], kFacts); }, {2, 4},
                                   "no more files");
    expectError<Loader::Exception>([&] { ConfigToBool(document["b"], kFacts); }, {2, 4},
                                   "no more files");
  }
}

TEST_F(ConfigReference, ForeignFailureIsKeptInside) {
  store_.at = {{"GetObject", [] { throw std::bad_alloc(); }}};
  try {
    number(reference("1"));
    FAIL() << "the failure was lost";
  } catch (const Loader::Exception &error) {
    EXPECT_EQ(std::bad_alloc().what(), error.msg);
    EXPECT_THROW(std::rethrow_if_nested(error), std::bad_alloc);
  }
}

// ---- the default

TEST_F(ConfigReference, DefaultMayBeAnExpression) {
  EXPECT_EQ(16.0f, number(reference("!calc numPCPUs * 2")));
  EXPECT_TRUE(flag(reference("!calc not isVm")));
  EXPECT_FALSE(flag(reference("!calc isVm")));
}

TEST_F(ConfigReference, DefaultMayBeAReference) {
  store_.objects["k2/c2/g2/"] = {{"f", 5L}};
  const std::string inner = "!config {object: [c2, g2, k2], key: f, default: 1}";
  EXPECT_EQ(5.0f, number(reference(inner)));
  const std::string innerFlag = "!config {object: [c2, g2, k2], key: f, default: no}";
  EXPECT_TRUE(flag(reference(innerFlag)));
}

TEST_F(ConfigReference, DefaultIsLookedUpFirstEvenWhenItIsNotNeeded) {
  hold(7L);
  EXPECT_EQ(7.0f, number(reference("!config {object: [c2, g2, k2], key: f, default: 1}")));
  const std::string global = "GetStore " + KestrelConfigStore::sGlobalNamespace;
  EXPECT_EQ(
      (Calls{global, "GetObject k2/c2/g2/", global, "GetObject k/c/g/", "GetValue long size"}),
      store_.calls);
}

TEST_F(ConfigReference, DefaultThatIsNoNumberFailsAlthoughAValueIsStored) {
  hold(7L);
  expectError<YAML::TypedBadConversion<float>>([] { number(reference("12 MB")); }, {1, 49},
                                               "bad conversion");
  expectError<YAML::TypedBadConversion<bool>>([] { flag(reference("1")); }, {1, 49},
                                              "bad conversion");
  expectError<Loader::Exception>([] { number(reference("'5'")); }, {1, 49}, "Unexpected tag !");
  expectError<Loader::Exception>([] { number(reference("~")); }, {1, 49}, "Unexpected tag ");
  expectError<Loader::Exception>([] { flag(reference("!calc foo")); }, {1, 49},
                                 "unexpected symbol: foo at 'foo'");
  EXPECT_EQ(Calls(), store_.calls);
}

// ---- shape

TEST_F(ConfigReference, KeysMayComeInAnyOrder) {
  hold(7L);
  EXPECT_EQ(7.0f, number("!config {default: 1, key: size, object: [c, g, k]}"));
}

TEST_F(ConfigReference, TagIsNotLookedAt) {
  hold(7L);
  EXPECT_EQ(7.0f, number("{object: [c, g, k], key: size, default: 1}"));
}

TEST_F(ConfigReference, ThatIsNoMappingIsRefused) {
  const std::string message = "invalid config specification";
  for (const char *text : {"!config 5", "!config ''", "!config [a, b, c]", "~", "!config ~"}) {
    expectRefused<Loader::Exception>(text, {1, 1}, message);
  }
  expectErrorAnywhere<Loader::Exception>(
      [] { ConfigToFloat(YAML::Node(YAML::NodeType::Undefined), kFacts); }, message);
}

TEST_F(ConfigReference, ThatIsInvalidIsTheLibrarysPlainError) {
  expectError<YAML::InvalidNode>([] { ConfigToFloat(invalidNode(), kFacts); }, kNowhere,
                                 kInvalidNode);
  expectError<YAML::InvalidNode>([] { ConfigToBool(invalidNode(), kFacts); }, kNowhere,
                                 kInvalidNode);
}

TEST_F(ConfigReference, UnknownKeyIsRefusedAtItsValue) {
  expectRefused<Loader::Exception>(
      "!config\nobject: [c, g, k]\nkey: size\ndefault: !calc 1\ncomment:  why\n", {5, 11},
      "invalid config field");
  expectRefused<Loader::Exception>("!config {Object: [c, g, k]}", {1, 18}, "invalid config field");
}

TEST_F(ConfigReference, KeyThatIsNoScalarIsABadConversionAtTheKey) {
  expectRefused<BadString>("!config {[a]: 1}", {1, 10}, "bad conversion");
  expectRefused<BadString>("!config {~: 1}", {1, 10}, "bad conversion");
}

TEST_F(ConfigReference, EmptyMappingLacksTheDefault) {
  expectRefused<Loader::Exception>("!config {}", {1, 1}, "missing default");
}

TEST_F(ConfigReference, DefaultIsMissedFirst) {
  expectRefused<Loader::Exception>("!config {object: [c, g, k]}", {1, 1}, "missing default");
  expectRefused<Loader::Exception>("!config {key: size}", {1, 1}, "missing default");
  expectRefused<Loader::Exception>("!config {object: [c, g, k], key: size}", {1, 1},
                                   "missing default");
}

TEST_F(ConfigReference, ObjectIsMissedSecond) {
  expectRefused<Loader::Exception>("!config {default: !calc 1}", {1, 1}, "missing object");
  expectRefused<Loader::Exception>("!config {default: !calc 1, key: size}", {1, 1},
                                   "missing object");
}

TEST_F(ConfigReference, FieldNameIsMissedLast) {
  const std::string rest = "default: !calc 1, object: [c, g, k]";
  expectRefused<Loader::Exception>("!config {" + rest + "}", {1, 1}, "missing value");
  expectRefused<Loader::Exception>("!config {" + rest + ", key: ''}", {1, 1}, "missing value");
}

TEST_F(ConfigReference, MissingPartIsReportedAtTheReference) {
  const YAML::Node document = yaml("a: 1\nb: !config {default: 1}\n");
  expectError<Loader::Exception>([&] { ConfigToFloat(document["b"], kFacts); }, {2, 4},
                                 "missing object");
}

TEST_F(ConfigReference, FieldNameMustBeAScalar) {
  expectRefused<BadString>("!config {key: [a]}", {1, 15}, "bad conversion");
  expectRefused<BadString>("!config {key: {a: b}}", {1, 15}, "bad conversion");
  expectRefused<BadString>("!config {key: ~}", {1, 15}, "bad conversion");
}

TEST_F(ConfigReference, FieldNameIsTakenWhateverItsTag) {
  hold(7L);
  EXPECT_EQ(7.0f, number("!config {object: [c, g, k], key: 'size', default: 1}"));
  EXPECT_EQ(7.0f, number("!config {object: [c, g, k], key: !math size, default: 1}"));
}

TEST_F(ConfigReference, KeyGivenTwiceTakesItsLastValue) {
  hold(7L);
  EXPECT_EQ(7.0f, number("!config {object: [c, g, k], key: other, key: size, default: 1}"));
  EXPECT_EQ(2.0f, number("!config {object: [x, g, k], key: size, default: 1, default: 2}"));
  expectError<Loader::Exception>(
      [] { number("!config {object: [c, g, k], key: size, key: '', default: 1}"); }, {1, 1},
      "missing value");
}

// ---- the object

TEST_F(ConfigReference, ObjectSequenceIsComponentGroupKey) {
  number("!config {object: [a, b, c], key: f, default: 1}");
  EXPECT_EQ("GetObject c/a/b/", store_.calls.back());
}

TEST_F(ConfigReference, ObjectSequenceMayBeLonger) {
  number("!config {object: [a, b, c, d, [e]], key: f, default: 1}");
  EXPECT_EQ("GetObject c/a/b/", store_.calls.back());
}

TEST_F(ConfigReference, ObjectSequenceWithoutAnElementIsAnInvalidNode) {
  for (const char *object : {"[]", "[a]", "[a, b]"}) {
    expectRefused<YAML::InvalidNode>(std::string("!config {object: ") + object + "}", kNowhere,
                                     kInvalidNode);
  }
}

TEST_F(ConfigReference, ObjectSequenceHoldsScalarsOnly) {
  expectRefused<BadString>("!config {object: [[a], b, c]}", {1, 19}, "bad conversion");
  expectRefused<BadString>("!config {object: [a, {b: 1}, c]}", {1, 22}, "bad conversion");
  expectRefused<BadString>("!config {object: [a, b, ~]}", {1, 25}, "bad conversion");
}

TEST_F(ConfigReference, ObjectMappingSetsThePartsThatItNames) {
  number("!config {object: {key: c, component: a, group: b}, key: f, default: 1}");
  EXPECT_EQ("GetObject c/a/b/", store_.calls.back());
  number("!config {object: {group: b}, key: f, default: 1}");
  EXPECT_EQ("GetObject //b/", store_.calls.back());
  number("!config {object: {}, key: f, default: 1}");
  EXPECT_EQ("GetObject ///", store_.calls.back());
}

TEST_F(ConfigReference, ObjectMappingTakesNoOtherKey) {
  const std::string message = "invalid objectID field";
  expectRefused<Loader::Exception>("!config\nobject: {group: b, extra: x}\n", {2, 20}, message);
  expectRefused<Loader::Exception>("!config\nobject: {Key: b}\n", {2, 10}, message);
}

TEST_F(ConfigReference, ObjectMappingHoldsScalarsOnly) {
  expectRefused<BadString>("!config {object: {group: [b]}}", {1, 26}, "bad conversion");
  expectRefused<BadString>("!config {object: {component: ~}}", {1, 30}, "bad conversion");
  expectRefused<BadString>("!config {object: {key: {a: b}}}", {1, 24}, "bad conversion");
  expectRefused<BadString>("!config {object: {[a]: b}}", {1, 19}, "bad conversion");
}

TEST_F(ConfigReference, ObjectThatIsAScalarIsRefused) {
  const std::string message = "invalid config object specification";
  expectRefused<Loader::Exception>("!config {object: host}", {1, 18}, message);
  expectRefused<Loader::Exception>("!config {object: ''}", {1, 18}, message);
}

TEST_F(ConfigReference, ObjectWithoutAValueLeavesEveryPartEmpty) {
  number("!config {object: ~, key: f, default: 1}");
  EXPECT_EQ("GetObject ///", store_.calls.back());
  number("!config\nobject:\nkey: f\ndefault: 1\n");
  EXPECT_EQ("GetObject ///", store_.calls.back());
  number("!config {object: !foo ~, key: f, default: 1}");
  EXPECT_EQ("GetObject ///", store_.calls.back());
}

TEST_F(ConfigReference, SecondObjectOverwritesOnlyWhatItGives) {
  number("!config {object: [a, b, c], object: {group: d}, key: f, default: 1}");
  EXPECT_EQ("GetObject c/a/d/", store_.calls.back());
  number("!config {object: [a, b, c], object: ~, key: f, default: 1}");
  EXPECT_EQ("GetObject c/a/b/", store_.calls.back());
}

}  // namespace
