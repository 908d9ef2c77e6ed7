// SPDX-License-Identifier: Apache-2.0
// How the installed mark is asked for, call by call, and what each answer of the system means. The
// system's function is this program's own here.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/xattr.h>

#include <cerrno>
#include <cstring>
#include <functional>
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

// What the system answers for the opened file, where that differs.
std::map<std::string, Answer> answersByDescriptor;

// Called once, after the mark of a path was read.
std::function<void()> afterPath;

}  // namespace

static ssize_t answer(const std::map<std::string, Answer> &scripted, const char *name, void *value,
                      size_t size) {
  const auto found = scripted.find(name);
  const Answer given = found == scripted.end() ? Answer{ENOTSUP, ""} : found->second;
  errno = given.error;
  if (given.error == 0 && size < given.value.size()) errno = ERANGE;
  if (errno != 0) return -1;
  std::memcpy(value, given.value.data(), given.value.size());
  return static_cast<ssize_t>(given.value.size());
}

extern "C" ssize_t getxattr(const char *path, const char *name, void *value, size_t size) noexcept {
  asked.push_back({path, name, size});
  const ssize_t result = answer(answers, name, value, size);
  const int error = errno;
  if (result > 0 && afterPath) afterPath();
  errno = error;
  return result;
}

extern "C" ssize_t fgetxattr(int, const char *name, void *value, size_t size) noexcept {
  const bool differs = answersByDescriptor.count(name) != 0;
  return answer(differs ? answersByDescriptor : answers, name, value, size);
}

namespace {

const std::string kPlain = "orrery.installed";
const std::string kUser = "user.orrery.installed";

class InstalledMark : public testing::Test {
 protected:
  InstalledMark() {
    answers.clear();
    answersByDescriptor.clear();
    asked.clear();
    afterPath = nullptr;
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

// ---- another process replaces the file after its mark was read

class ReplacedFile : public InstalledMark {
 protected:
  // Puts OTHER in the place of the file at that moment.
  void replaceBy(const std::string &other) {
    afterPath = [this, other] { ASSERT_EQ(0, rename(other.c_str(), path_.c_str())); };
  }
  const std::string other_ = folder_.path() / "other";
};

TEST_F(ReplacedFile, IsNotInstalledWithoutAMarkOfItsOwn) {
  for (const int error : {ENODATA, ENOTSUP, EPERM, EACCES}) {
    answers = {{kUser, {0, "\x01"}}};
    answersByDescriptor = {{kUser, {error, ""}}};
    ::Test::writeFile(other_, "- name: b\n");
    replaceBy(other_);
    EXPECT_FALSE(installed()) << std::strerror(error);
  }
}

TEST_F(ReplacedFile, WithAMarkOfItsOwnIsRead) {
  answers = {{kPlain, {0, "\x01"}}};
  ::Test::writeFile(other_, "- name: b\n");
  replaceBy(other_);
  EXPECT_EQ("host/opt/b", Loader::loadPools({path_}, false).at(0)->name);
}

TEST_F(ReplacedFile, ByAFifoIsABadFileAndNoHang) {
  answers = {{kPlain, {0, "\x01"}}};
  ASSERT_EQ(0, mkfifo(other_.c_str(), 0600));
  replaceBy(other_);
  try {
    Loader::loadPools({path_}, false);
    FAIL() << "a FIFO was read";
  } catch (const Loader::FileError &error) {
    EXPECT_EQ(path_ + ": bad file", error.what());
  }
}

// Not on Linux, which has no attribute of that name.
TEST_F(ReplacedFile, PlainNameThatOnlyPathsHaveIsEnough) {
  answers = {{kPlain, {0, "\x01"}}};
  answersByDescriptor = {{kPlain, {ENOTSUP, ""}}};
  EXPECT_TRUE(installed());
  answersByDescriptor = {{kPlain, {ENODATA, ""}}};
  EXPECT_FALSE(installed());
}

}  // namespace
