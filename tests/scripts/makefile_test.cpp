// SPDX-License-Identifier: Apache-2.0
// The Makefile's targets that no other test runs.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <sstream>
#include <string>
#include <vector>

#include "world.h"

namespace Test {
namespace {

namespace fs = std::filesystem;
using testing::HasSubstr;

std::vector<std::string> targets() {
  const std::string makefile = readFile(SOURCE_FOLDER "/Makefile");
  const size_t begin = makefile.find(".PHONY:") + 7;
  std::istringstream words(makefile.substr(begin, makefile.find("\nMAKEFLAGS") - begin));
  std::vector<std::string> names;
  for (std::string word; words >> word;)
    if (word != "\\") names.push_back(word);
  return names;
}

TEST(Makefile, HelpNamesEveryTarget) {
  const World world;
  const ProcessResult result = world.run("/usr/bin/make", {"-C", SOURCE_FOLDER, "help"});
  EXPECT_EQ(result.status, 0) << result.err;
  EXPECT_GT(targets().size(), 15U);
  for (const std::string &target : targets())
    EXPECT_THAT(result.out, HasSubstr(" " + target + " "));
}

TEST(Makefile, ContributingExplainsEveryTarget) {
  const std::string page = readFile(SOURCE_FOLDER "/CONTRIBUTING.md");
  for (const std::string &target : targets()) {
    const std::string command = target == "all" ? "`make`" : "`make " + target + "`";
    EXPECT_THAT(page, HasSubstr(command));
  }
}

std::vector<std::string> filesBelow(const fs::path &folder) {
  std::vector<std::string> files;
  for (const fs::directory_entry &entry : fs::recursive_directory_iterator(folder))
    if (!entry.is_directory()) files.push_back(fs::relative(entry.path(), folder).string());
  return files;
}

TEST(Uninstall, RemovesWhatInstallPutThereAndNothingElse) {
  World world;
  world.environment["DESTDIR"] = (world.folder() / "root").string();
  ASSERT_EQ(world.run("/usr/bin/cmake", {"--install", BUILD_FOLDER, "--prefix", "/opt/x"}).status,
            0);
  const fs::path prefix = world.folder() / "root/opt/x";
  ASSERT_GT(filesBelow(prefix).size(), 15U);
  writeFile(prefix / "bin/other", "");
  writeFile(prefix / "share/doc/poolctl/notes-of-the-owner", "");

  const ProcessResult result =
      world.run(SOURCE_FOLDER "/scripts/uninstall", {BUILD_FOLDER, "/opt/x"});

  EXPECT_EQ(result.status, 0) << result.err;
  EXPECT_THAT(filesBelow(prefix),
              testing::UnorderedElementsAre("bin/other", "share/doc/poolctl/notes-of-the-owner"));
  EXPECT_FALSE(fs::exists(prefix / "share/doc/poolctl/examples"));
}

}  // namespace
}  // namespace Test
