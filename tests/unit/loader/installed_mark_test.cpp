// SPDX-License-Identifier: Apache-2.0
// How the installed mark is asked for, call by call, and what each answer of the system means. The
// system's function is this program's own here.
#include <gtest/gtest.h>
#include <sys/xattr.h>

#include <cerrno>
#include <cstring>
#include <map>
#include <string>
#include <vector>

#include "loader/definition_files.h"
#include "loader/file_error.h"
#include "temp_folder.h"

namespace {

struct Answer {
  int error;  // 0: the value is given
  std::string value;
};

struct Asked {
  std::string path, name;
  size_t size;
};

// What the system answers for each name; a name that is missing is not supported.
std::map<std::string, Answer> answers;
std::vector<Asked> asked;

}  // namespace

extern "C" ssize_t getxattr(const char *path, const char *name, void *value, size_t size) noexcept {
  asked.push_back({path, name, size});
  const auto found = answers.find(name);
  const Answer answer = found == answers.end() ? Answer{ENOTSUP, ""} : found->second;
  errno = answer.error;
  if (answer.error == 0 && size < answer.value.size()) errno = ERANGE;
  if (errno != 0) return -1;
  std::memcpy(value, answer.value.data(), answer.value.size());
  return static_cast<ssize_t>(answer.value.size());
}

namespace {

const std::string kPlain = "orrery.installed";
const std::string kUser = "user.orrery.installed";

class InstalledMark : public testing::Test {
 protected:
  InstalledMark() {
    answers.clear();
    asked.clear();
    ::Test::writeFile(path_, "- name: a\n");
  }

  bool installed() {
    try {
      return Loader::loadPools({path_}, false).size() == 1;
    } catch (const Loader::FileError &error) {
      EXPECT_EQ(path_ + ": is not installed", error.what());
      return false;
    }
  }

  std::vector<std::string> namesAsked() {
    std::vector<std::string> names;
    for (const Asked &one : asked) {
      EXPECT_EQ(path_, one.path);
      EXPECT_EQ(1u, one.size) << "the mark is one byte";
      names.push_back(one.name);
    }
    return names;
  }

  ::Test::TempFolder folder_;
  const std::string path_ = folder_.path() / "pools";
};

using Names = std::vector<std::string>;

TEST_F(InstalledMark, IsAskedForByItsPlainNameOnly) {
  answers[kPlain] = {0, "\x01"};
  EXPECT_TRUE(installed());
  EXPECT_EQ(Names{kPlain}, namesAsked());
}

TEST_F(InstalledMark, IsAskedForInTheUsersSpaceWhereThePlainNameIsNotSupported) {
  answers[kUser] = {0, "\x01"};
  EXPECT_TRUE(installed());
  EXPECT_EQ((Names{kPlain, kUser}), namesAsked());
}

TEST_F(InstalledMark, PlainNameThatIsThereDecidesAlone) {
  answers[kUser] = {0, "\x01"};
  for (const std::string &value : {std::string(1, '\0'), std::string("1"), std::string()}) {
    answers[kPlain] = {0, value};
    asked.clear();
    EXPECT_FALSE(installed());
    EXPECT_EQ(Names{kPlain}, namesAsked());
  }
}

TEST_F(InstalledMark, OtherErrorsOfThePlainNameDecideAlone) {
  answers[kUser] = {0, "\x01"};
  for (const int error : {ENODATA, ENOENT, EACCES, EPERM, ERANGE, EIO}) {
    answers[kPlain] = {error, ""};
    asked.clear();
    EXPECT_FALSE(installed()) << std::strerror(error);
    EXPECT_EQ(Names{kPlain}, namesAsked());
  }
}

TEST_F(InstalledMark, SameRuleHoldsForBothNames) {
  for (const std::string &name : {kPlain, kUser}) {
    for (const std::string &value : {std::string(1, '\0'), std::string("\x02"), std::string("1"),
                                     std::string(), std::string("\x01\x01")}) {
      answers = {{name, {0, value}}};
      EXPECT_FALSE(installed()) << name;
    }
  }
}

TEST_F(InstalledMark, ThatIsSupportedNowhereIsMissing) {
  EXPECT_FALSE(installed());
  EXPECT_EQ((Names{kPlain, kUser}), namesAsked());
}

TEST_F(InstalledMark, OfAFileThatCannotBeReadLeadsToABadFile) {
  answers[kPlain] = {0, "\x01"};
  const std::string path = folder_.path() / "gone";
  try {
    Loader::loadPools({path}, false);
    FAIL() << "a missing file was read";
  } catch (const Loader::FileError &error) {
    EXPECT_EQ(path + ": bad file", error.what());
    EXPECT_THROW(std::rethrow_if_nested(error), YAML::BadFile);
  }
}

TEST_F(InstalledMark, IsAskedForFileByFile) {
  answers[kPlain] = {0, "\x01"};
  const std::string bad = folder_.path() / "bad";
  ::Test::writeFile(bad, "- scalar\n");
  EXPECT_THROW(Loader::loadPools({path_, bad, path_}, false), Loader::FileError);
  ASSERT_EQ(2u, asked.size());
  EXPECT_EQ(path_, asked[0].path);
  EXPECT_EQ(bad, asked[1].path);
}

}  // namespace
