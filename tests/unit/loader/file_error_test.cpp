// SPDX-License-Identifier: Apache-2.0
// The text of an error that names a definition file.
#include "loader/file_error.h"

#include <gtest/gtest.h>

#include <type_traits>

namespace {

using Loader::FileError;

static_assert(std::is_base_of_v<std::runtime_error, FileError>);

YAML::Mark mark(int pos, int line, int column) {
  YAML::Mark made;
  made.pos = pos;
  made.line = line;
  made.column = column;
  return made;
}

TEST(FileError, CountsLinesAndColumnsFromOne) {
  EXPECT_STREQ("/etc/rp.d/a: line 3 column 5: bad",
               FileError("/etc/rp.d/a", "bad", mark(20, 2, 4)).what());
}

TEST(FileError, StartOfTheFileIsAPlace) {
  EXPECT_STREQ("a: line 1 column 1: bad", FileError("a", "bad", YAML::Mark()).what());
}

TEST(FileError, NullMarkNamesNoPlace) {
  EXPECT_STREQ("a: bad", FileError("a", "bad", YAML::Mark::null_mark()).what());
}

TEST(FileError, MarkIsNullOnlyInAllItsParts) {
  EXPECT_STREQ("a: line 0 column 0: bad", FileError("a", "bad", mark(0, -1, -1)).what());
  EXPECT_STREQ("a: line 1 column 0: bad", FileError("a", "bad", mark(-1, 0, -1)).what());
  EXPECT_STREQ("a: line 0 column 1: bad", FileError("a", "bad", mark(-1, -1, 0)).what());
}

TEST(FileError, KeepsPathAndMessageAsTheyAre) {
  EXPECT_STREQ("../a b: :", FileError("../a b", ":", YAML::Mark::null_mark()).what());
  EXPECT_STREQ(": ", FileError("", "", YAML::Mark::null_mark()).what());
}

}  // namespace
