// SPDX-License-Identifier: Apache-2.0
// The exchange format: bytes, types, round trips over every code point, and every refusal.
#include <gmock/gmock.h>

#include <cmath>
#include <limits>
#include <random>

#include "kestrel/exchange_read.h"
#include "kestrel/exchange_write.h"

namespace Kestrel {
namespace {

using ::testing::StartsWith;

std::vector<StoredObject> objectWith(const Value &value) {
  return {{{"k", "c", "g", ""}, {{"f", value}}}};
}

std::string refusal(const std::string &text) {
  try {
    readExchange(text, "F");
  } catch (const ExchangeError &error) {
    return error.what();
  }
  return {};
}

Value readBack(const Value &value) {
  return readExchange(writeExchange(objectWith(value)), "F").at(0).fields.at("f");
}

// The one field of an object whose value is written so.
Value read(const std::string &written) {
  return readExchange("- {component: c, group: g, key: k, fields: {f: " + written + "}}", "F")
      .at(0)
      .fields.at("f");
}

std::string fieldRefusal(const std::string &written) {
  return refusal("- {component: c, group: g, key: k, fields: {f: " + written + "}}");
}

std::string utf8(uint32_t point) {
  const auto byte = [](uint32_t value) { return static_cast<char>(value); };
  if (point < 0x80) return {byte(point)};
  if (point < 0x800) return {byte(0xC0 | point >> 6), byte(0x80 | (point & 0x3F))};
  if (point < 0x10000) {
    return {byte(0xE0 | point >> 12), byte(0x80 | (point >> 6 & 0x3F)),
            byte(0x80 | (point & 0x3F))};
  }
  return {byte(0xF0 | point >> 18), byte(0x80 | (point >> 12 & 0x3F)),
          byte(0x80 | (point >> 6 & 0x3F)), byte(0x80 | (point & 0x3F))};
}

TEST(Exchange, WritesObjectsWithTheirTypes) {
  EXPECT_EQ(writeExchange({{{"backup", "host", "pools", ""},
                            {{"a", int64_t{-7}},
                             {"b", 7.0},
                             {"c", true},
                             {"d", std::string("7")},
                             {"e", std::string("\"\\\n")},
                             {"on", false}}},
                           {{"", "a b", "yes", "x"}, {}}}),
            "- component: host\n"
            "  group: pools\n"
            "  key: backup\n"
            "  fields:\n"
            "    a: -7\n"
            "    b: 7.0\n"
            "    c: true\n"
            "    d: \"7\"\n"
            "    e: \"\\\"\\\\\\n\"\n"
            "    \"on\": false\n"
            "- component: \"a b\"\n"
            "  group: \"yes\"\n"
            "  key: \"\"\n"
            "  extra: x\n"
            "  fields: {}\n");
}

TEST(Exchange, AnEmptyStoreIsAnEmptySequence) {
  EXPECT_EQ(writeExchange({}), "[]\n");
  EXPECT_TRUE(readExchange("[]\n", "F").empty());
}

TEST(Exchange, NumbersAtTheEndsOfTheirRangesComeBack) {
  for (const Value &value :
       {Value(std::numeric_limits<int64_t>::min()), Value(std::numeric_limits<int64_t>::max()),
        Value(5e-324), Value(std::numeric_limits<double>::max()), Value(-0.0), Value(0.1),
        Value(std::numeric_limits<double>::infinity()),
        Value(-std::numeric_limits<double>::infinity())}) {
    EXPECT_EQ(readBack(value), value);
  }
  EXPECT_TRUE(std::signbit(std::get<double>(readBack(-0.0))));
  EXPECT_TRUE(std::isnan(std::get<double>(readBack(std::numeric_limits<double>::quiet_NaN()))));
}

TEST(Exchange, TextsThatLookLikeOtherTypesStayTexts) {
  for (const char *text :
       {"7",   "7.0",  "true", "false", "null", "~",  "",         " ",       "nan", ".nan",
        "- a", "a: b", "# a",  "!calc", "&a",   "*a", "{}",       "[]",      "|",   ">",
        "%",   "@",    "`",    "'",     "\"",   "\\", "a\r\nb\n", "\ttab\t", "---", "..."}) {
    EXPECT_EQ(readBack(std::string(text)), Value(std::string(text))) << text;
  }
}

TEST(Exchange, EveryCodePointComesBackInTextsAndNames) {
  std::string block;
  for (uint32_t point = 0; point <= 0x10FFFF; ++point) {
    if (point >= 0xD800 && point <= 0xDFFF) continue;
    block += utf8(point);
    if (block.size() < 16384 && point != 0x10FFFF) continue;
    ASSERT_EQ(readBack(block), Value(block)) << "up to " << point;
    if (point < 0x4000 || point > 0x10F000) {
      // Names are written and read as texts are, but hold no NUL.
      block.erase(0, block.find_first_not_of('\0'));
      const std::vector<StoredObject> named = {{{block, block, block, block}, {{block, 0.5}}}};
      const auto back = readExchange(writeExchange(named), "F");
      ASSERT_EQ(back.at(0).id.key, block);
      ASSERT_EQ(back.at(0).fields.count(block), 1U);
    }
    block.clear();
  }
}

TEST(Exchange, WritingWhatWasReadGivesTheSameBytes) {
  std::mt19937 engine(7);
  const auto random = [&engine](uint32_t below) { return static_cast<uint32_t>(engine() % below); };
  const auto anyText = [&random] {
    std::string text;
    for (uint32_t size = random(6); size > 0; --size) text += utf8(1 + random(0x2FF));
    return text;
  };
  std::vector<StoredObject> objects;
  for (int i = 0; i < 200; ++i) {
    StoredObject object{{anyText(), anyText(), std::to_string(i), anyText()}, {}};
    object.fields.emplace("t" + anyText(), anyText());
    object.fields.emplace("i" + anyText(), int64_t{random(1U << 31)} << 20);
    object.fields.emplace("r" + anyText(), random(1U << 31) / 3.0);
    object.fields.emplace("b" + anyText(), random(2) == 0);
    objects.push_back(object);
  }
  const std::string bytes = writeExchange(objects);
  EXPECT_EQ(writeExchange(readExchange(bytes, "F")), bytes);
}

TEST(Exchange, HandWrittenScalarsHaveTheTypeOfTheirForm) {
  EXPECT_EQ(read("7"), Value(int64_t{7}));
  EXPECT_EQ(read("1e3"), Value(1000.0));
  EXPECT_EQ(read("true"), Value(true));
  EXPECT_EQ(read("some words"), Value(std::string("some words")));
  EXPECT_EQ(read("'7'"), Value(std::string("7")));
  EXPECT_EQ(read("\"true\""), Value(std::string("true")));
  EXPECT_EQ(read("!!str 7"), Value(std::string("7")));
  EXPECT_EQ(read("!!float 7"), Value(7.0));
  EXPECT_EQ(read("!!int '7'"), Value(int64_t{7}));
  EXPECT_EQ(read("!!bool true"), Value(true));
}

TEST(Exchange, AValueThatIsNoneIsRefusedWithItsPlace) {
  EXPECT_THAT(fieldRefusal("~"), StartsWith("F:1:48: a field is an integer"));
  EXPECT_THAT(fieldRefusal("[1]"), StartsWith("F:1:48: a field is an integer"));
  EXPECT_THAT(fieldRefusal("{a: 1}"), StartsWith("F:1:48: a field is an integer"));
  EXPECT_THAT(fieldRefusal("!calc 1"), StartsWith("F:1:48: unknown tag \"!calc\""));
  EXPECT_THAT(fieldRefusal("99999999999999999999"), StartsWith("F:1:48: \"99999999999999999999\""));
  EXPECT_THAT(fieldRefusal("!!int 7.5"), StartsWith("F:1:48: \"7.5\" is not an integer"));
  EXPECT_THAT(fieldRefusal("1, f: 2"), StartsWith("F:1:51: field \"f\" is given twice"));
  EXPECT_THAT(fieldRefusal("1, '': 2"), StartsWith("F:1:55: the field's name is empty"));
}

TEST(Exchange, AnObjectThatIsNoneIsRefusedWithItsPlace) {
  EXPECT_EQ(refusal(""), "F: the file is empty");
  EXPECT_EQ(refusal("a: b"), "F:1:1: a sequence of objects is expected");
  EXPECT_EQ(refusal("~"), "F:1:1: a sequence of objects is expected");
  EXPECT_EQ(refusal("- 7"), "F:1:3: an object is a mapping");
  EXPECT_EQ(refusal("- {group: g, key: k, fields: {}}"), "F:1:3: no \"component\"");
  EXPECT_EQ(refusal("- {component: c, key: k, fields: {}}"), "F:1:3: no \"group\"");
  EXPECT_EQ(refusal("- {component: c, group: g, fields: {}}"), "F:1:3: no \"key\"");
  EXPECT_EQ(refusal("- {component: c, group: g, key: k}"), "F:1:3: no \"fields\"");
  EXPECT_EQ(refusal("- {component: c, component: d}"), "F:1:18: \"component\" is given twice");
  EXPECT_EQ(refusal("- {colour: c}"), "F:1:4: unknown key \"colour\"");
  EXPECT_EQ(refusal("- {component: [c]}"), "F:1:15: a text is expected");
  EXPECT_EQ(refusal("- {component: c, group: g, key: k, fields: [a]}"),
            "F:1:44: the fields are a mapping");
  EXPECT_EQ(refusal("- {component: c, group: g, key: \"\\0\", fields: {}}"),
            "F:1:3: the key holds a NUL");
}

TEST(Exchange, AnObjectGivenTwiceIsRefused) {
  const std::string object = "- {component: c, group: g, key: k, fields: {}}\n";
  EXPECT_EQ(refusal(object + object), "F:2:3: c/g/k is given twice");
}

TEST(Exchange, WhatIsNoYamlIsRefusedWithItsPlace) {
  EXPECT_THAT(refusal("- {a: \n"), StartsWith("F:2:1: "));
  EXPECT_EQ(refusal("- \xff"), "F: the file is not UTF-8");
  EXPECT_EQ(refusal("--- []\n--- []\n"), "F: the file holds more than one document");
}

TEST(Exchange, WhatIsNotUtf8IsNotWritten) {
  EXPECT_THROW(writeExchange(objectWith(std::string("\xff"))), ValueError);
  EXPECT_THROW(writeExchange({{{"\xff", "", "", ""}, {}}}), ValueError);
}

}  // namespace
}  // namespace Kestrel
