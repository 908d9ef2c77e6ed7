// SPDX-License-Identifier: Apache-2.0
// The written forms of values: which text is which type, and that printing and reading are inverse.
#include "kestrel/value.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <limits>
#include <random>

namespace Kestrel {
namespace {

Type formOf(const std::string &text) {
  return typeOf(parseByForm(text));
}

TEST(ValueForm, DigitsAreAnInteger) {
  EXPECT_EQ(parseByForm("7"), Value(int64_t{7}));
  EXPECT_EQ(parseByForm("+7"), Value(int64_t{7}));
  EXPECT_EQ(parseByForm("-0012"), Value(int64_t{-12}));
}

TEST(ValueForm, TheWholeRangeOf64BitsIsAnInteger) {
  EXPECT_EQ(parseByForm("9223372036854775807"), Value(std::numeric_limits<int64_t>::max()));
  EXPECT_EQ(parseByForm("-9223372036854775808"), Value(std::numeric_limits<int64_t>::min()));
}

TEST(ValueForm, AnIntegerBeyond64BitsIsRefusedAndNotMadeAnotherType) {
  EXPECT_THROW(parseByForm("9223372036854775808"), ValueError);
  EXPECT_THROW(parseByForm("-9223372036854775809"), ValueError);
}

TEST(ValueForm, ADotOrAnExponentMakesAReal) {
  EXPECT_EQ(parseByForm("0.5"), Value(0.5));
  EXPECT_EQ(parseByForm("1e3"), Value(1000.0));
  EXPECT_EQ(parseByForm("-.5"), Value(-0.5));
  EXPECT_EQ(parseByForm("5."), Value(5.0));
  EXPECT_EQ(parseByForm("+2.5E-1"), Value(0.25));
}

TEST(ValueForm, ARealBeyondItsRangeIsRefused) {
  EXPECT_THROW(parseByForm("1e999"), ValueError);
  EXPECT_THROW(parseByForm("-1e999"), ValueError);
}

TEST(ValueForm, OnlyTheTwoLowerCaseWordsAreTruthValues) {
  EXPECT_EQ(parseByForm("true"), Value(true));
  EXPECT_EQ(parseByForm("false"), Value(false));
  for (const char *text : {"True", "FALSE", "yes", "no", "on", " true"}) {
    EXPECT_EQ(formOf(text), Type::kText) << text;
  }
}

TEST(ValueForm, AnythingElseIsAText) {
  for (const char *text : {"",     " ",  "-",  "+",     ".",   "-.",  "e3",  ".e3", "1e",    "1e+",
                           "0x10", "1 ", " 1", "1.2.3", "nan", "inf", "1,5", "--1", "1e3.0", "~"}) {
    EXPECT_EQ(formOf(text), Type::kText) << "\"" << text << "\"";
  }
}

TEST(ValueAs, ATypeThatDoesNotFitTheTextIsRefused) {
  EXPECT_THROW(parseAs(Type::kInteger, "7.0"), ValueError);
  EXPECT_THROW(parseAs(Type::kInteger, ""), ValueError);
  EXPECT_THROW(parseAs(Type::kReal, "seven"), ValueError);
  EXPECT_THROW(parseAs(Type::kReal, "NaN"), ValueError);
  EXPECT_THROW(parseAs(Type::kBoolean, "1"), ValueError);
  EXPECT_THROW(parseAs(Type::kText, "\xff"), ValueError);
}

TEST(ValueAs, ATypeTakesWhatItsFormAloneWouldNotSay) {
  EXPECT_EQ(parseAs(Type::kReal, "7"), Value(7.0));
  EXPECT_EQ(parseAs(Type::kText, "7"), Value(std::string("7")));
  EXPECT_EQ(parseAs(Type::kText, "true"), Value(std::string("true")));
  EXPECT_TRUE(std::isnan(std::get<double>(parseAs(Type::kReal, "nan"))));
  EXPECT_EQ(parseAs(Type::kReal, "-inf"), Value(-std::numeric_limits<double>::infinity()));
}

TEST(ValuePrint, ARealNeverLooksLikeAnInteger) {
  EXPECT_EQ(print(7.0), "7.0");
  EXPECT_EQ(print(-0.0), "-0.0");
  EXPECT_EQ(print(0.1), "0.1");
  EXPECT_EQ(print(1e300), "1e+300");
  EXPECT_EQ(print(std::numeric_limits<double>::infinity()), "inf");
  EXPECT_EQ(print(-std::numeric_limits<double>::infinity()), "-inf");
  EXPECT_EQ(print(std::numeric_limits<double>::quiet_NaN()), "nan");
}

TEST(ValuePrint, EveryFiniteRealReadsBackBitForBit) {
  std::mt19937_64 random(20261120);
  for (int i = 0; i < 100000; ++i) {
    const uint64_t bits = random();
    double value = 0;
    std::memcpy(&value, &bits, sizeof value);
    if (!std::isfinite(value)) continue;
    const double back = std::get<double>(parseByForm(print(value)));
    ASSERT_EQ(std::memcmp(&value, &back, sizeof value), 0) << print(value);
  }
}

TEST(ValuePrint, IntegersTruthValuesAndTextsReadBack) {
  for (const Value &value :
       {Value(std::numeric_limits<int64_t>::min()), Value(int64_t{0}), Value(true), Value(false)}) {
    EXPECT_EQ(parseByForm(print(value)), value);
  }
  EXPECT_EQ(print(std::string("7\n\"")), "7\n\"");
}

TEST(ValueType, EveryTypeIsFoundByItsOwnName) {
  for (const Type type : {Type::kInteger, Type::kReal, Type::kBoolean, Type::kText}) {
    EXPECT_EQ(typeNamed(typeName(type)), type);
    EXPECT_NE(kTypeNames.find(typeName(type)), std::string_view::npos);
  }
  EXPECT_EQ(typeNamed("Integer"), std::nullopt);
  EXPECT_EQ(typeNamed(""), std::nullopt);
}

TEST(Utf8, WellFormedTextsAreTaken) {
  for (const char *text : {"", "a", "\x7f", "\xc2\x80", "\xdf\xbf", "\xe0\xa0\x80", "\xed\x9f\xbf",
                           "\xee\x80\x80", "\xf0\x90\x80\x80", "\xf4\x8f\xbf\xbf"}) {
    EXPECT_TRUE(isUtf8(text));
  }
}

TEST(Utf8, OverlongCutSurrogateAndTooLargeSequencesAreRefused) {
  for (const char *text :
       {"\x80", "\xbf", "\xc0\x80", "\xc1\xbf", "\xc2", "\xc2g", "\xe0\x9f\xbf", "\xed\xa0\x80",
        "\xe2\x82", "\xf0\x8f\xbf\xbf", "\xf4\x90\x80\x80", "\xf5\x80\x80\x80", "\xff", "ok\xfe"}) {
    EXPECT_FALSE(isUtf8(text));
  }
}

}  // namespace
}  // namespace Kestrel
