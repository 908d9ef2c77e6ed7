// SPDX-License-Identifier: Apache-2.0
// The folder of definition files, which is the test's own: /etc is another one in the process of
// each test.
#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <string>
#include <system_error>
#include <vector>

#include "loader/definition_files.h"
#include "loader/file_error.h"
#include "own_process.h"
#include "private_etc.h"
#include "temp_folder.h"

namespace {

namespace fs = std::filesystem;
using Loader::loadPools;
using Names = std::vector<std::string>;

class DefinitionFolder : public testing::Test {
 protected:
  void SetUp() override {
    if (!::Test::privateEtcUnavailable().empty()) GTEST_SKIP() << ::Test::privateEtcUnavailable();
    ::Test::makePrivateEtc(etc_);
    fs::create_directory(rpd());
  }

  void TearDown() override { ::Test::removePrivateEtc(etc_); }

  fs::path rpd() const { return etc_ / "rp.d"; }

  void put(const fs::path &name, const std::string &content, bool installed = true) {
    ::Test::writeFile(rpd() / name, content);
    if (installed) ::Test::setInstalledMark(rpd() / name);
  }

  // Runs BODY where the test's folder is /etc.
  template <typename Body>
  void within(Body body) {
    inOwnProcess([&] {
      const char *const step = ::Test::enterPrivateEtc(etc_);
      ASSERT_EQ(nullptr, step) << step << ": " << std::strerror(errno);
      body();
    });
  }

  void expectPools(const Names &expected) {
    within([&] {
      Names names;
      for (const auto &pool : loadPools({}, false)) names.push_back(pool->name);
      EXPECT_EQ(expected, names);
    });
  }

  template <typename Error>
  void expectFailure(const std::string &text) {
    within([&] {
      try {
        loadPools({}, false);
        ADD_FAILURE() << "nothing was thrown instead of: " << text;
      } catch (const Error &error) {
        EXPECT_EQ(text, error.what());
      }
    });
  }

 private:
  ::Test::TempFolder folder_;
  const fs::path etc_ = folder_.path() / "etc";
};

TEST_F(DefinitionFolder, ThatIsEmptyGivesNoPools) {
  expectPools({});
}

TEST_F(DefinitionFolder, GivesThePoolsOfAllItsFiles) {
  put("web.yaml", "- name: web\n- name: db\n");
  put("no-suffix", "- name: agent\n");
  put("odd.txt~", "- name: odd\n");
  put("empty", "");
  expectPools({"host/opt/agent", "host/opt/db", "host/opt/odd", "host/opt/web"});
}

TEST_F(DefinitionFolder, SkipsHiddenFilesThatAreInstalled) {
  put(".hidden", "- name: hidden\n");
  put("..odd", "- name: hidden\n");
  expectPools({});
}

TEST_F(DefinitionFolder, SkipsHiddenFilesThatAreNotInstalled) {
  put(".hidden", "broken: [", false);
  expectPools({});
}

TEST_F(DefinitionFolder, SkipsLinksAndFolders) {
  put(".target", "- name: target\n");
  fs::create_symlink(".target", rpd() / "link");
  fs::create_symlink("nowhere", rpd() / "dangling");
  fs::create_directory(rpd() / "folder");
  ::Test::writeFile(rpd() / "folder" / "inner", "- name: inner\n");
  expectPools({});
}

TEST_F(DefinitionFolder, WithAFileThatIsNotInstalledIsRefused) {
  put("stray", "- name: a\n", false);
  expectFailure<Loader::FileError>("/etc/rp.d/stray: is not installed");
}

TEST_F(DefinitionFolder, FaultInAFileIsReportedWithItsFullPath) {
  put("bad", "- name: a\n  bogus: 1\n");
  expectFailure<Loader::FileError>("/etc/rp.d/bad: line 2 column 3: invalid rp field");
}

TEST_F(DefinitionFolder, ThatIsMissingIsTheSystemsError) {
  fs::remove(rpd());
  expectFailure<std::system_error>("/etc/rp.d: No such file or directory");
  within([] {
    try {
      loadPools({}, true);
      ADD_FAILURE() << "nothing was thrown";
    } catch (const std::system_error &error) {
      EXPECT_EQ(std::error_code(ENOENT, std::generic_category()), error.code());
    }
  });
}

TEST_F(DefinitionFolder, ThatIsAFileIsTheSystemsError) {
  fs::remove(rpd());
  ::Test::writeFile(rpd(), "- name: a\n");
  expectFailure<std::system_error>("/etc/rp.d: Not a directory");
}

TEST_F(DefinitionFolder, ThatIsMissingDoesNotMatterToNamedFiles) {
  put("pools", "- name: a\n");
  fs::rename(rpd() / "pools", rpd().parent_path() / "pools");
  fs::remove(rpd());
  within([] { EXPECT_EQ(1u, loadPools({"/etc/pools"}, false).size()); });
}

TEST_F(DefinitionFolder, IsNotReadWhenFilesAreNamed) {
  put("pools", "- name: a\n");
  put("stray", "broken: [", false);
  within([] { EXPECT_EQ(1u, loadPools({"/etc/rp.d/pools"}, false).size()); });
}

TEST_F(DefinitionFolder, RelativePathsStayRelative) {
  put("pools", "- name: a\n");
  put("stray", "- name: b\n", false);
  within([] {
    fs::current_path("/etc");
    EXPECT_EQ(1u, loadPools({"rp.d/pools"}, false).size());
    try {
      loadPools({"rp.d/../rp.d/stray"}, false);
      ADD_FAILURE() << "nothing was thrown";
    } catch (const Loader::FileError &error) {
      EXPECT_STREQ("rp.d/../rp.d/stray: is not installed", error.what());
    }
  });
}

}  // namespace
