// SPDX-License-Identifier: Apache-2.0
// poolctl-install as its users run it: what it puts in place, what it refuses, and what is left
// when something fails half way.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/xattr.h>

#include <filesystem>
#include <string>
#include <thread>
#include <vector>

#include "temp_folder.h"
#include "world.h"

namespace {

using ::Test::Arguments;
using ::Test::lines;
using ::Test::ProcessResult;
using ::Test::readFile;
using ::Test::setInstalledMark;
using ::Test::World;
using ::Test::writeFile;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::StartsWith;
using testing::UnorderedElementsAre;
namespace fs = std::filesystem;

constexpr const char *kGood = "- name: a\n  memMin: 16\n";
constexpr const char *kOther = "- name: b\n  memMin: 32\n";
constexpr const char *kBad = "- name: a\n  memMinimum: 16\n";

// A file whose content is a definition without pools, in a file system without user attributes.
constexpr const char *kUnmarkable = "/proc/self/comm";

std::string markOf(const fs::path &path) {
  for (const char *name : {"orrery.installed", "user.orrery.installed"}) {
    char value[8];
    const ssize_t size = getxattr(path.c_str(), name, value, sizeof value);
    if (size >= 0) return std::string(value, static_cast<size_t>(size));
  }
  return "none";
}

unsigned modeOf(const fs::path &path) {
  return static_cast<unsigned>(fs::status(path).permissions());
}

std::vector<std::string> entriesOf(const fs::path &folder) {
  std::vector<std::string> names;
  for (const auto &entry : fs::directory_iterator(folder))
    names.push_back(entry.path().filename().string());
  return names;
}

class Install : public testing::Test {
 protected:
  void SetUp() override { SKIP_WITHOUT_PRIVATE_ETC(); }

  // A file of the user's own, without a mark.
  std::string source(const std::string &name, std::string_view yaml) {
    const fs::path path = world.folder() / name;
    writeFile(path, yaml);
    return path.string();
  }

  ProcessResult install(const Arguments &arguments) {
    (void)world.etc();
    return world.run("poolctl-install", arguments);
  }

  void expectRefusal(const ProcessResult &result, const std::string &message, int status = 1) {
    EXPECT_EQ(result.status, status);
    EXPECT_EQ(result.out, "");
    EXPECT_EQ(result.err, "poolctl-install: " + message + "\n");
  }

  World world;
};

TEST_F(Install, FileIsCopiedMarkedAndReadableForAll) {
  const std::string path = source("a.yaml", kGood);
  fs::permissions(path, fs::perms::owner_read);

  const ProcessResult result = install({path});

  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(result.out + result.err, "");
  EXPECT_EQ(readFile(world.rpD() / "a.yaml"), kGood);
  EXPECT_EQ(markOf(world.rpD() / "a.yaml"), "\x01");
  EXPECT_EQ(modeOf(world.rpD() / "a.yaml"), 0644u);
  EXPECT_THAT(world.poolctl({"list", "-v"}).out, HasSubstr("\nhost/opt/a,yes,16,"));
}

TEST_F(Install, TheUsersOwnFileGetsNoMark) {
  const std::string path = source("a.yaml", kGood);
  install({path});
  EXPECT_EQ(markOf(path), "none");
}

TEST_F(Install, MissingFolderIsMadeForAllToRead) {
  ASSERT_EQ(install({source("a.yaml", kGood)}).status, 0);
  EXPECT_EQ(modeOf(world.etc() / "rp.d"), 0755u);
}

TEST_F(Install, RefusalLeavesNoFolderThatWasNotThere) {
  EXPECT_EQ(install({source("a.yaml", kBad)}).status, 1);
  EXPECT_FALSE(fs::exists(world.etc() / "rp.d"));
}

TEST_F(Install, BadDefinitionIsRefusedWithTheLoadersMessageForTheUsersFile) {
  world.rpD();
  const std::string path = source("a.yaml", kBad);
  expectRefusal(install({path}), path + ": line 2 column 3: invalid rp field");
  EXPECT_THAT(entriesOf(world.rpD()), IsEmpty());
}

TEST_F(Install, BrokenYamlIsRefused) {
  const std::string path = source("a.yaml", "- [\n");
  const ProcessResult result = install({path});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, StartsWith("poolctl-install: " + path + ": line "));
}

TEST_F(Install, EmptyFileIsADefinitionWithoutPools) {
  EXPECT_EQ(install({source("a.yaml", "")}).status, 0);
  EXPECT_EQ(world.poolctl({"list"}).status, 0);
}

TEST_F(Install, MissingFileIsNamed) {
  const std::string path = (world.folder() / "none.yaml").string();
  expectRefusal(install({path}), path + ": No such file or directory", 3);
}

TEST_F(Install, FolderIsNoDefinition) {
  const std::string path = world.folder().string();
  expectRefusal(install({path}), path + ": Is a directory");
}

TEST_F(Install, OneBadFileOfSeveralInstallsNone) {
  world.rpD();
  const std::string good = source("a.yaml", kGood);
  EXPECT_EQ(install({good, source("b.yaml", kBad)}).status, 1);
  EXPECT_THAT(entriesOf(world.rpD()), IsEmpty());
}

TEST_F(Install, FileOfTheSameNameIsReplaced) {
  install({source("a.yaml", kGood)});
  EXPECT_EQ(install({source("a.yaml", kOther)}).status, 0);
  EXPECT_EQ(readFile(world.rpD() / "a.yaml"), kOther);
  EXPECT_THAT(entriesOf(world.rpD()), ElementsAre("a.yaml"));
}

TEST_F(Install, InstalledFileCanBeInstalledAgainFromItsOwnPlace) {
  install({source("a.yaml", kGood)});
  EXPECT_EQ(install({"/etc/rp.d/a.yaml"}).status, 0);
  EXPECT_EQ(readFile(world.rpD() / "a.yaml"), kGood);
}

TEST_F(Install, FailureAtALaterFileTakesANewOneAway) {
  fs::create_directories(world.rpD() / "b.yaml" / "inside");
  EXPECT_EQ(install({source("a.yaml", kGood), source("b.yaml", kOther)}).status, 1);
  EXPECT_THAT(entriesOf(world.rpD()), ElementsAre("b.yaml"));
}

TEST_F(Install, FailureAtALaterFilePutsAReplacedOneBack) {
  install({source("a.yaml", kGood)});
  fs::create_directories(world.rpD() / "b.yaml" / "inside");
  EXPECT_EQ(install({source("a.yaml", kOther), source("b.yaml", kOther)}).status, 1);
  EXPECT_EQ(readFile(world.rpD() / "a.yaml"), kGood);
  EXPECT_EQ(markOf(world.rpD() / "a.yaml"), "\x01");
  EXPECT_THAT(entriesOf(world.rpD()), UnorderedElementsAre("a.yaml", "b.yaml"));
}

TEST_F(Install, NameThatNoScanWouldReadIsRefused) {
  const std::string path = source(".a.yaml", kGood);
  expectRefusal(install({path}), "'" + path + "': no name for an installed file", 2);
}

TEST_F(Install, TwoFilesOfOneNameAreRefused) {
  fs::create_directory(world.folder() / "other");
  const std::string first = source("a.yaml", kGood);
  const std::string second = source("other/a.yaml", kOther);
  expectRefusal(install({first, second}), second + ": another file of this name is given too", 2);
}

TEST_F(Install, ReadersSeeTheOldOrTheNewFileAndNeverAPart) {
  const std::string first = source("a.yaml", kGood);
  fs::create_directory(world.folder() / "other");
  const std::string second = source("other/a.yaml", kOther);
  ASSERT_EQ(install({first}).status, 0);

  std::thread installer([&] {
    for (int i = 0; i < 20; ++i) EXPECT_EQ(install({i % 2 == 0 ? second : first}).status, 0);
  });
  for (int i = 0; i < 20; ++i) {
    const ProcessResult list = world.poolctl({"list", "-v"});
    EXPECT_EQ(list.status, 0) << list.err;
    EXPECT_EQ(lines(list.out).size(), 2u) << list.out;
  }
  installer.join();
}

TEST_F(Install, MarkIsSetWhereTheFileStands) {
  const std::string path = source("a.yaml", kGood);
  EXPECT_EQ(install({"--mark", path}).status, 0);
  EXPECT_EQ(markOf(path), "\x01");
  EXPECT_EQ(world.poolctl({"list", path}).status, 0);
  EXPECT_FALSE(fs::exists(world.etc() / "rp.d"));
}

TEST_F(Install, MarkOfAnotherValueBecomesTheMark) {
  const std::string path = source("a.yaml", kGood);
  setInstalledMark(path, "no");
  EXPECT_EQ(install({"--mark", path}).status, 0);
  EXPECT_EQ(markOf(path), "\x01");
}

TEST_F(Install, BadFileIsNotMarked) {
  const std::string good = source("a.yaml", kGood);
  const std::string bad = source("b.yaml", kBad);
  expectRefusal(install({"--mark", good, bad}), bad + ": line 2 column 3: invalid rp field");
  EXPECT_EQ(markOf(good), "none");
  EXPECT_EQ(markOf(bad), "none");
}

TEST_F(Install, FileSystemWithoutAttributesIsNamedAndMarksAreTakenBack) {
  const std::string fresh = source("a.yaml", kGood);
  const std::string old = source("b.yaml", kGood);
  setInstalledMark(old, "no");

  const ProcessResult result = install({"--mark", fresh, old, kUnmarkable});

  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, StartsWith(std::string("poolctl-install: ") + kUnmarkable +
                                     ": the file system (type 0x9fa0) cannot hold the installed"));
  EXPECT_EQ(markOf(fresh), "none");
  EXPECT_EQ(markOf(old), "no");
}

TEST_F(Install, RemoveTakesTheNamedFilesAway) {
  install({source("a.yaml", kGood), source("b.yaml", kOther), source("c.yaml", kGood)});
  EXPECT_EQ(install({"--remove", "a.yaml", "c.yaml"}).status, 0);
  EXPECT_THAT(entriesOf(world.rpD()), ElementsAre("b.yaml"));
}

TEST_F(Install, RemoveOfANameThatIsNotThereRemovesNone) {
  install({source("a.yaml", kGood)});
  expectRefusal(install({"--remove", "a.yaml", "b.yaml"}),
                "/etc/rp.d/b.yaml: No such file or directory", 3);
  EXPECT_THAT(entriesOf(world.rpD()), ElementsAre("a.yaml"));
}

TEST_F(Install, RemoveOfOneNameTwicePutsTheFileBack) {
  install({source("a.yaml", kGood)});
  EXPECT_EQ(install({"--remove", "a.yaml", "a.yaml"}).status, 1);
  EXPECT_EQ(readFile(world.rpD() / "a.yaml"), kGood);
  EXPECT_EQ(markOf(world.rpD() / "a.yaml"), "\x01");
}

TEST_F(Install, RemoveTakesNoPathAndNoHiddenName) {
  install({source("a.yaml", kGood)});
  for (const char *name : {"./a.yaml", "/etc/rp.d/a.yaml", "../passwd", ".", "..", ".a", ""}) {
    expectRefusal(install({"--remove", name}),
                  "'" + std::string(name) + "': no name for an installed file", 2);
  }
}

TEST_F(Install, RemoveTakesRegularFilesOnly) {
  fs::create_symlink("/dev/null", world.rpD() / "link");
  expectRefusal(install({"--remove", "link"}), "/etc/rp.d/link: is no regular file");
}

TEST_F(Install, RemoveWithoutAFolderFails) {
  expectRefusal(install({"--remove", "a.yaml"}), "/etc/rp.d: No such file or directory", 3);
}

TEST_F(Install, HelpGoesToStandardOutput) {
  const ProcessResult result = install({"--help"});
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(result.err, "");
  for (const char *word : {"FILE", "--mark", "--remove", "Exit status"})
    EXPECT_THAT(result.out, HasSubstr(word));
}

TEST_F(Install, WrongUsageHasAStatusOfItsOwn) {
  const std::string path = source("a.yaml", kGood);
  for (const Arguments &arguments :
       {Arguments{}, {"--mark"}, {"--mark", "--remove", path}, {"--frob", path}}) {
    const ProcessResult result = install(arguments);
    EXPECT_EQ(result.status, 2);
    EXPECT_EQ(result.out, "");
    EXPECT_NE(result.err, "");
  }
  EXPECT_EQ(markOf(path), "none");
}

}  // namespace
