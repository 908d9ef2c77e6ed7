// SPDX-License-Identifier: Apache-2.0
// Named definition files: what is read from them, how the pools are sorted, how every failure
// names its file, and the lookup of one pool.
#include "loader/definition_files.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <filesystem>
#include <ios>
#include <stdexcept>
#include <string>
#include <string_view>
#include <typeinfo>
#include <vector>

#include "loader/file_error.h"
#include "temp_folder.h"
#include "yaml/exception.h"
#include "yaml_support.h"

// A leak checker's, where there is one.
extern "C" {
__attribute__((weak)) void __lsan_disable();
__attribute__((weak)) void __lsan_enable();
}

namespace {

// The yaml library loses its read buffer when the file cannot be read.
class LeaksOfTheLibrary {
 public:
  LeaksOfTheLibrary() {
    if (__lsan_disable != nullptr) __lsan_disable();
  }
  ~LeaksOfTheLibrary() {
    if (__lsan_enable != nullptr) __lsan_enable();
  }
  LeaksOfTheLibrary(const LeaksOfTheLibrary &) = delete;
  LeaksOfTheLibrary &operator=(const LeaksOfTheLibrary &) = delete;
};

using Loader::FileError;
using Loader::loadPools;
using Loader::PoolList;
using Names = std::vector<std::string>;

Names namesOf(const PoolList &pools) {
  Names names;
  for (const auto &pool : pools) names.push_back(pool->name);
  return names;
}

class DefinitionFile : public testing::Test {
 protected:
  // Makes a file of that content in the test's folder, installed.
  std::string installed(const std::string &name, const std::string &content) {
    const std::string path = notInstalled(name, content);
    ::Test::setInstalledMark(path);
    return path;
  }

  std::string notInstalled(const std::string &name, const std::string &content) {
    const std::string path = folder_.path() / name;
    ::Test::writeFile(path, content);
    return path;
  }

  // Loading PATH fails with that text, and keeps an Inner error inside.
  template <typename Inner>
  void expectFailure(const std::string &path, const std::string &text) {
    try {
      loadPools({path}, false);
      ADD_FAILURE() << "nothing was thrown instead of: " << text;
    } catch (const FileError &error) {
      EXPECT_EQ(path + ": " + text, error.what());
      EXPECT_THROW(std::rethrow_if_nested(error), Inner);
    }
  }

  // Loading FILES fails because PATH is not installed, and that is all there is to it.
  void expectNotInstalled(const std::vector<std::string> &files, const std::string &path) {
    try {
      loadPools(files, false);
      ADD_FAILURE() << "was taken for installed";
    } catch (const FileError &error) {
      EXPECT_EQ(path + ": is not installed", error.what());
      EXPECT_EQ(nullptr, dynamic_cast<const std::nested_exception *>(&error));
    }
  }

  ::Test::TempFolder folder_;
};

// ---- what is read

TEST_F(DefinitionFile, GivesOnePoolForEachItem) {
  const std::string path = installed("pools", "- name: b\n  mem: 5\n- {name: a, isEnabled: no}\n");
  const PoolList pools = loadPools({path}, false);
  ASSERT_EQ((Names{"host/opt/a", "host/opt/b"}), namesOf(pools));
  EXPECT_FALSE(pools[0]->isEnabled);
  EXPECT_EQ(5, int64_t{pools[1]->mem.max});
}

TEST_F(DefinitionFile, WithoutASequenceDeclaresNothing) {
  for (const char *content :
       {"", "\n\n", "# nothing\n", "---\n", "~", "scalar", "'5'", "[]", "{}"}) {
    EXPECT_TRUE(loadPools({installed("pools", content)}, false).empty()) << content;
  }
}

TEST_F(DefinitionFile, OnlyItsFirstDocumentIsRead) {
  EXPECT_EQ(Names{"host/opt/a"},
            namesOf(loadPools({installed("pools", "---\n- name: a\n---\n- name: b\n")}, false)));
}

TEST_F(DefinitionFile, IsReadAnewByEveryCall) {
  const std::string path = installed("pools", "- name: a\n");
  EXPECT_EQ(Names{"host/opt/a"}, namesOf(loadPools({path}, false)));
  installed("pools", "- name: b\n");
  EXPECT_EQ(Names{"host/opt/b"}, namesOf(loadPools({path}, false)));
}

TEST_F(DefinitionFile, MayBeNamedTwice) {
  const std::string path = installed("pools", "- name: a\n");
  EXPECT_EQ((Names{"host/opt/a", "host/opt/a"}), namesOf(loadPools({path, path}, false)));
}

TEST_F(DefinitionFile, NamedByALinkIsRead) {
  installed("pools", "- name: a\n");
  std::filesystem::create_symlink("pools", folder_.path() / "link");
  EXPECT_EQ(Names{"host/opt/a"}, namesOf(loadPools({folder_.path() / "link"}, false)));
}

TEST_F(DefinitionFile, NamedMayBeHidden) {
  EXPECT_EQ(Names{"host/opt/a"}, namesOf(loadPools({installed(".hidden", "- name: a\n")}, false)));
}

TEST_F(DefinitionFile, FromTheLoaderItselfNeedsNoMark) {
  const PoolList pools = Loader::readFile(notInstalled("pools", "- name: b\n- name: a\n"));
  EXPECT_EQ((Names{"host/opt/b", "host/opt/a"}), namesOf(pools));
}

// ---- the order

TEST_F(DefinitionFile, PoolsOfAllFilesAreSortedByName) {
  const std::string one = installed("1", "- name: a/b\n- name: b\n");
  const std::string other = installed("2", "- name: a\n");
  const Names ascending = {"host/opt/a", "host/opt/a/b", "host/opt/b"};
  EXPECT_EQ(ascending, namesOf(loadPools({one, other}, false)));
  EXPECT_EQ(ascending, namesOf(loadPools({other, one}, false)));
  EXPECT_EQ(Names(ascending.rbegin(), ascending.rend()), namesOf(loadPools({one, other}, true)));
}

TEST_F(DefinitionFile, NamesAreSortedByteByByte) {
  const std::string path = installed(
      "pools", "- name: é\n- name: b\n- name: B\n- name: a-b\n- name: a/b\n- name: a\n- name: z\n");
  EXPECT_EQ((Names{"host/opt/B", "host/opt/a", "host/opt/a-b", "host/opt/a/b", "host/opt/b",
                   "host/opt/z", "host/opt/é"}),
            namesOf(loadPools({path}, false)));
}

TEST_F(DefinitionFile, SameNameInTwoFilesGivesTwoPools) {
  const std::string one = installed("1", "- {name: a, mem: 1}\n");
  const std::string other = installed("2", "- {name: host/opt/a, mem: 2}\n");
  const PoolList pools = loadPools({one, other}, false);
  ASSERT_EQ((Names{"host/opt/a", "host/opt/a"}), namesOf(pools));
  EXPECT_EQ(3, int64_t{pools[0]->mem.min} + int64_t{pools[1]->mem.min});
}

TEST_F(DefinitionFile, ManyPoolsOfOneNameAreSorted) {
  std::string content;
  for (int i = 0; i < 1000; ++i) content += "- name: p" + std::to_string(i % 3) + "\n";
  const PoolList pools = loadPools({installed("pools", content)}, true);
  ASSERT_EQ(1000u, pools.size());
  EXPECT_EQ("host/opt/p2", pools.front()->name);
  EXPECT_EQ("host/opt/p0", pools.back()->name);
}

// ---- the installed mark

TEST_F(DefinitionFile, WithoutTheMarkIsRefused) {
  const std::string path = notInstalled("pools", "- name: a\n");
  expectNotInstalled({path}, path);
}

TEST_F(DefinitionFile, ThatDoesNotExistIsRefusedAlike) {
  const std::string path = folder_.path() / "nowhere";
  expectNotInstalled({path}, path);
  expectNotInstalled({""}, "");
}

TEST_F(DefinitionFile, MarkIsExactlyTheOneByteOne) {
  using namespace std::string_view_literals;
  const std::string path = notInstalled("pools", "- name: a\n");
  for (const std::string_view value :
       {"\0"sv, "1"sv, "\x02"sv, "\xff"sv, ""sv, "\x01\x01"sv, "\x01\0"sv}) {
    ::Test::setInstalledMark(path, value);
    expectNotInstalled({path}, path);
  }
  ::Test::setInstalledMark(path, "\x01"sv);
  EXPECT_EQ(1u, loadPools({path}, false).size());
}

TEST_F(DefinitionFile, MarkIsLookedAtBeforeTheContent) {
  const std::string path = notInstalled("pools", "{ broken");
  expectNotInstalled({path}, path);
}

TEST_F(DefinitionFile, FirstFailureEndsTheLoad) {
  const std::string good = installed("good", "- name: a\n");
  const std::string bad = installed("bad", "- scalar\n");
  const std::string missing = folder_.path() / "missing";
  expectNotInstalled({good, missing, bad}, missing);
  try {
    loadPools({good, bad, missing}, false);
    FAIL() << "a bad file was overlooked";
  } catch (const FileError &error) {
    EXPECT_EQ(bad + ": line 1 column 3: expected a map", error.what());
  }
}

// ---- failures within a file

TEST_F(DefinitionFile, FaultOfAPoolIsReportedWithItsPlace) {
  expectFailure<Loader::Exception>(installed("pools", "- name: a\n  bogus: 1\n"),
                                   "line 2 column 3: invalid rp field");
  expectFailure<Loader::Exception>(installed("pools", "- mem: 1\n"),
                                   "line 1 column 3: rp missing name");
  expectFailure<Loader::Exception>(installed("pools", "- name: a\n  mem: !calc foo + 1\n"),
                                   "line 2 column 8: unexpected symbol: foo at 'foo + 1'");
  expectFailure<YAML::TypedBadConversion<float>>(installed("pools", "- name: a\n  mem: 12 MB\n"),
                                                 "line 2 column 8: bad conversion");
  expectFailure<YAML::TypedBadConversion<std::string>>(installed("pools", "- name: ~\n"),
                                                       "line 1 column 9: bad conversion");
}

TEST_F(DefinitionFile, MappingAtTheTopIsAnInvalidNode) {
  expectFailure<YAML::InvalidNode>(installed("pools", "name: a\nmem: 5\n"), kInvalidNode);
  expectFailure<YAML::InvalidNode>(installed("pools", "pools:\n- name: a\n"), kInvalidNode);
}

TEST_F(DefinitionFile, InvalidNodeNeverNamesAKey) {
  expectFailure<YAML::InvalidNode>(
      installed("pools", "- name: a\n  mem: !config {object: [a], key: k, default: 1}\n"),
      kInvalidNode);
}

TEST_F(DefinitionFile, SyntaxErrorIsTheParsersBareMessageAtItsPlace) {
  expectFailure<YAML::ParserException>(installed("pools", "- name: a\n- name: b\n-   @x\n"),
                                       "line 3 column 5: unknown token");
}

TEST_F(DefinitionFile, SyntaxErrorAfterAGoodPoolGivesNoPools) {
  const std::string path = installed("pools", "- name: a\n- [b\n");
  EXPECT_THROW(loadPools({path}, false), FileError);
}

TEST_F(DefinitionFile, FolderInItsPlaceIsReportedWithTheSystemsWords) {
  const std::string path = folder_.path() / "folder";
  std::filesystem::create_directory(path);
  ::Test::setInstalledMark(path);
  const LeaksOfTheLibrary ignored;
  try {
    loadPools({path}, false);
    FAIL() << "a folder was read";
  } catch (const FileError &error) {
    try {
      std::rethrow_if_nested(error);
      FAIL() << "the cause was lost";
    } catch (const std::ios_base::failure &cause) {
      EXPECT_EQ(path + ": " + cause.what(), error.what());
    }
  }
}

TEST_F(DefinitionFile, FileErrorOfAFaultHoldsItsCause) {
  const std::string path = installed("pools", "- scalar\n");
  try {
    loadPools({path}, false);
    FAIL() << "a scalar is no pool";
  } catch (const FileError &error) {
    EXPECT_NE(nullptr, dynamic_cast<const std::nested_exception *>(&error));
    expectError<Loader::Exception>([&] { std::rethrow_if_nested(error); }, {1, 3},
                                   "expected a map");
  }
}

TEST_F(DefinitionFile, FromTheLoaderItselfNamesItsFileToo) {
  const std::string path = notInstalled("pools", "- scalar\n");
  try {
    Loader::readFile(path);
    FAIL() << "a scalar is no pool";
  } catch (const FileError &error) {
    EXPECT_EQ(path + ": line 1 column 3: expected a map", error.what());
  }
}

TEST_F(DefinitionFile, ThatCannotBeReadIsABadFile) {
  const std::string path = folder_.path() / "nowhere";
  try {
    Loader::readFile(path);
    FAIL() << "a missing file was read";
  } catch (const FileError &error) {
    EXPECT_EQ(path + ": bad file", error.what());
    EXPECT_THROW(std::rethrow_if_nested(error), YAML::BadFile);
  }
}

// ---- bounds

class DefinitionBounds : public DefinitionFile {
 protected:
  static std::string pools(size_t count) {
    std::string content;
    for (size_t i = 0; i < count; ++i) content += "- {name: a}\n";
    return content;
  }

  // A file of that size, most of it NULs.
  std::string fileOf(std::uintmax_t bytes) {
    const std::string path = installed("large", "- {name: a}\n");
    std::filesystem::resize_file(path, bytes);
    return path;
  }
};

TEST_F(DefinitionBounds, SixtyFourMegabytesAreTheMost) {
  constexpr std::uintmax_t kMax = 64 << 20;
  const std::string message = "file is larger than 64 MB";
  try {
    loadPools({fileOf(kMax)}, false);
  } catch (const FileError &error) {
    EXPECT_EQ(std::string::npos, std::string(error.what()).find(message)) << error.what();
  }
  expectFailure<Loader::Exception>(fileOf(kMax + 1), message);
  EXPECT_THROW(Loader::readFile(fileOf(kMax + 1)), FileError);
}

TEST_F(DefinitionBounds, OneHundredThousandPoolsInAllFilesAreTheMost) {
  const std::string half = installed("half", pools(50000));
  EXPECT_EQ(100000u, loadPools({half, half}, false).size());
  const std::string more = installed("more", "\n- {name: a}\n");
  try {
    loadPools({half, half, more}, false);
    FAIL() << "a pool too many";
  } catch (const FileError &error) {
    EXPECT_EQ(more + ": line 2 column 3: more than 100000 pools", error.what());
  }
}

// By aliases a small file would take as much memory as it has pools, times the length of a name.
TEST_F(DefinitionBounds, NamesOfSixtyFourMegabytesAreTheMost) {
  const size_t prefix = std::string("host/opt/").size();
  std::string content = "- name: &n " + std::string((1 << 20) - prefix, 'n') + "\n";
  for (int i = 1; i < 64; ++i) content += "- name: *n\n";
  EXPECT_EQ(64u, loadPools({installed("names", content)}, false).size());
  expectFailure<Loader::Exception>(installed("names", content + "- name: b\n"),
                                   "line 65 column 3: names of pools take more than 64 MB");
}

// ---- the lookup

class FindPool : public DefinitionFile {
 protected:
  void expectNotFound(const std::string &name, const PoolList &pools) {
    try {
      Loader::findPool(name, pools);
      ADD_FAILURE() << name << " was found";
    } catch (const std::runtime_error &error) {
      EXPECT_EQ(typeid(std::runtime_error), typeid(error));
      EXPECT_EQ(name + " not found", error.what());
    }
  }
};

TEST_F(FindPool, FindsAPoolByItsFullPath) {
  const PoolList pools = loadPools({installed("pools", "- name: a\n- name: b\n")}, false);
  EXPECT_EQ(pools[1], Loader::findPool("host/opt/b", pools));
}

TEST_F(FindPool, GivesTheFirstOfSeveral) {
  const PoolList pools = loadPools({installed("pools", "- name: a\n- name: a\n")}, false);
  EXPECT_EQ(pools[0], Loader::findPool("host/opt/a", pools));
}

TEST_F(FindPool, ShortOrOtherNamesAreNotFound) {
  const PoolList pools = loadPools({installed("pools", "- name: a\n")}, false);
  for (const char *name : {"a", "host/opt/A", "host/opt/a/", "host/opt/", "host/opt/ab", ""}) {
    expectNotFound(name, pools);
  }
}

TEST_F(FindPool, NothingIsFoundInAnEmptyList) {
  expectNotFound("host/opt/a", {});
}

}  // namespace
