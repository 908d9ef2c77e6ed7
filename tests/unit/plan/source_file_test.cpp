// SPDX-License-Identifier: Apache-2.0
// From a byte of a scalar's value back to the place in the file.
#include "plan_check/source_file.h"

#include <gtest/gtest.h>
#include <yaml-cpp/yaml.h>

#include <string>

namespace {

using Plan::Place;
using Plan::SourceFile;

// The place of the first "x" of the scalar under "k", as LINE:COLUMN from 1.
std::string placeOfX(const std::string &text) {
  const SourceFile source("file", text);
  const YAML::Node node = YAML::Load(text)["k"];
  const Place place = source.placeInScalar(node.Mark(), node.Scalar(), node.Scalar().find('x'));
  return std::to_string(place.line + 1) + ":" + std::to_string(place.column + 1);
}

TEST(PlaceInScalar, IsFoundInEveryStyle) {
  EXPECT_EQ(placeOfX("k: 1 + x\n"), "1:8");
  EXPECT_EQ(placeOfX("k: !calc 1 + x\n"), "1:14");
  EXPECT_EQ(placeOfX("k: &anchor !calc 1 + x\n"), "1:22");
  EXPECT_EQ(placeOfX("k: !calc '1 + x'\n"), "1:15");
  EXPECT_EQ(placeOfX("k: !calc \"1 + x\"\n"), "1:15");
  EXPECT_EQ(placeOfX("k: !calc 1 +\n     2 +\n     x\n"), "3:6");
  EXPECT_EQ(placeOfX("k: !calc >\n  1 +\n  x\n"), "3:3");
  EXPECT_EQ(placeOfX("k: !calc |\n  1 +\n\n  2 + x\n"), "4:7");
}

TEST(PlaceInScalar, BehindAnEscapeIsThatOfTheScalar) {
  EXPECT_EQ(placeOfX("k: \"\\t1 + x\"\n"), "1:4");
}

TEST(PlaceInScalar, IsFoundInFilesOfOtherSystems) {
  EXPECT_EQ(placeOfX("a: 1\r\nk: 1 + x\r\n"), "2:8");
}

TEST(SourceLine, HasNoLineEnd) {
  const SourceFile source("file", "one\r\ntwo\nthree");
  EXPECT_EQ(source.line(0), "one");
  EXPECT_EQ(source.line(1), "two");
  EXPECT_EQ(source.line(2), "three");
  EXPECT_EQ(source.line(3), "");
  EXPECT_EQ(source.line(-1), "");
}

TEST(PlaceOfMark, BehindTheLastLineIsTheEnd) {
  const SourceFile source("file", "one\ntwo");
  YAML::Mark mark = YAML::Mark::null_mark();
  EXPECT_EQ(source.placeOf(mark).line, -1);
  mark.pos = mark.line = 9;
  mark.column = 0;
  EXPECT_EQ(source.placeOf(mark).line, 1);
  EXPECT_EQ(source.placeOf(mark).column, 3);
}

TEST(OpenQuote, IsOneThatTheFileDoesNotClose) {
  const SourceFile source("file", "a: 'x'\nb: \"y\n");
  EXPECT_FALSE(source.isOpenQuote({0, 3}));
  EXPECT_TRUE(source.isOpenQuote({1, 3}));
  EXPECT_FALSE(source.isOpenQuote({0, 0}));
}

}  // namespace
