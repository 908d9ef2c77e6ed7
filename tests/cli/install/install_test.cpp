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

#include "install_fixture.h"

namespace {

using ::Test::Arguments;
using ::Test::entriesOf;
using ::Test::kBad;
using ::Test::kGood;
using ::Test::kOther;
using ::Test::lines;
using ::Test::ProcessResult;
using ::Test::readFile;
using ::Test::setInstalledMark;
using ::Test::writeFile;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::StartsWith;
using testing::UnorderedElementsAre;
namespace fs = std::filesystem;

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

using Install = ::Test::InstallFixture;

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

TEST_F(Install, UsersOwnFileGetsNoMark) {
  const std::string path = source("a.yaml", kGood);
  install({path});
  EXPECT_EQ(markOf(path), "none");
}

TEST_F(Install, MissingFolderIsCreatedReadableForAll) {
  ASSERT_EQ(install({source("a.yaml", kGood)}).status, 0);
  EXPECT_EQ(modeOf(world.etc() / "rp.d"), 0755u);
}

TEST_F(Install, RefusalLeavesNoNewFolder) {
  EXPECT_EQ(install({source("a.yaml", kBad)}).status, 1);
  EXPECT_FALSE(fs::exists(world.etc() / "rp.d"));
}

TEST_F(Install, BadDefinitionIsRefusedWithItsPlaceAndCause) {
  world.rpD();
  const std::string path = source("a.yaml", kBad);
  const ProcessResult result = install({path});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err,
              StartsWith(path + ":2:3: error: unknown key \"memMinimum\" [unknown-key]\n"));
  EXPECT_THAT(result.err, HasSubstr("\npoolctl-install: 1 error; nothing is installed "
                                    "(--force installs all the same)\n"));
  EXPECT_THAT(entriesOf(world.rpD()), IsEmpty());
}

TEST_F(Install, BrokenYamlIsRefused) {
  const std::string path = source("a.yaml", "- [\n");
  const ProcessResult result = install({path});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, StartsWith(path + ":1:3: error: a bracket is not closed"));
}

TEST_F(Install, WhatLoadWouldRefuseIsRefused) {
  const ProcessResult result =
      install({source("a.yaml", "- name: a\n  memMin: 300\n  memMax: 200\n")});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, HasSubstr("error: memMin 300 is above memMax 200 [min-above-max]"));
}

TEST_F(Install, ErrorsAreInstalledWithForce) {
  const ProcessResult result = install({"--force", source("a.yaml", kBad)});
  EXPECT_EQ(result.status, 0);
  EXPECT_THAT(result.err, HasSubstr("error: unknown key"));
  EXPECT_THAT(entriesOf(world.rpD()), ElementsAre("a.yaml"));
}

TEST_F(Install, WarningsArePrintedAndTheFileIsInstalled) {
  const ProcessResult result = install({source("a.yaml", "- name: a\n  memMax: 2\n")});
  EXPECT_EQ(result.status, 0);
  EXPECT_THAT(result.err, HasSubstr("a.yaml:2:3: warning: the maximum is 2 MB"));
  EXPECT_THAT(entriesOf(world.rpD()), ElementsAre("a.yaml"));
}

TEST_F(Install, ErrorsOfOtherInstalledFilesDoNotCount) {
  world.definition("z.yaml", kBad);
  const ProcessResult result = install({source("a.yaml", kOther)});
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(result.err, "");
}

TEST_F(Install, ErrorsThatTheNewFileCausesElsewhereCount) {
  ASSERT_EQ(world.run("knobctl", {"boot", "--cpus", "4", "--memory", "1024"}).status, 0);
  world.definition("z.yaml", "- name: z\n  memMin: 600\n");
  const ProcessResult result = install({source("a.yaml", "- name: a\n  memMin: 600\n")});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, HasSubstr("/etc/rp.d/z.yaml:2:3: error: the memory does not fit"));
}

TEST_F(Install, ParentsMayBeInstalledAlready) {
  world.definition("web.yaml", "- name: web\n  memMax: 512\n");
  const std::string child = source("cache.yaml", "- name: web/cache\n  memMax: 64\n");
  EXPECT_EQ(install({child}).err, "");
}

TEST_F(Install, LoadedPoolsThatKeepTheirValuesAreNamed) {
  ASSERT_EQ(install({source("a.yaml", "- name: a\n  memMax: 128\n")}).status, 0);
  ASSERT_EQ(world.poolctl({"load"}).status, 0);
  const ProcessResult result = install({source("a.yaml", "- name: a\n  memMax: 160\n")});
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(result.err,
            "poolctl-install: note: host/opt/a is loaded with other values and keeps them; "
            "poolctl-plan diff shows them, and poolctl-plan apply changes them\n");
}

TEST_F(Install, WithoutAKernelOnlyWhatNeedsOneIsLeftUnchecked) {
  writeFile(world.folder() / "knob.conf", "kernel = none\n");
  const ProcessResult good =
      install({source("a.yaml", "- name: a\n  memMax: !calc physKB / 4096\n")});
  EXPECT_EQ(good.status, 0);
  EXPECT_THAT(good.err, StartsWith("poolctl-install: note: no usable kernel: "));
  EXPECT_THAT(good.err, HasSubstr("`knobctl status`"));
  EXPECT_EQ(install({source("b.yaml", kBad)}).status, 1);
}

TEST_F(Install, EmptyFileDeclaresNoPools) {
  EXPECT_EQ(install({source("a.yaml", "")}).status, 0);
  EXPECT_EQ(world.poolctl({"list"}).status, 0);
}

TEST_F(Install, MissingFileIsNamed) {
  const std::string path = (world.folder() / "none.yaml").string();
  expectRefusal(install({path}), path + ": No such file or directory", 3);
}

TEST_F(Install, FolderIsRefused) {
  const std::string path = world.folder().string();
  expectRefusal(install({path}), path + ": not a regular file");
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

TEST_F(Install, InstalledFileCanBeInstalledAgain) {
  install({source("a.yaml", kGood)});
  EXPECT_EQ(install({"/etc/rp.d/a.yaml"}).status, 0);
  EXPECT_EQ(readFile(world.rpD() / "a.yaml"), kGood);
}

TEST_F(Install, FailureAtALaterFileRemovesANewOne) {
  fs::create_directories(world.rpD() / "b.yaml" / "inside");
  EXPECT_EQ(install({source("a.yaml", kGood), source("b.yaml", kOther)}).status, 1);
  EXPECT_THAT(entriesOf(world.rpD()), ElementsAre("b.yaml"));
}

TEST_F(Install, FailureAtALaterFileRestoresAReplacedOne) {
  install({source("a.yaml", kGood)});
  fs::create_directories(world.rpD() / "b.yaml" / "inside");
  EXPECT_EQ(install({source("a.yaml", kOther), source("b.yaml", kOther)}).status, 1);
  EXPECT_EQ(readFile(world.rpD() / "a.yaml"), kGood);
  EXPECT_EQ(markOf(world.rpD() / "a.yaml"), "\x01");
  EXPECT_THAT(entriesOf(world.rpD()), UnorderedElementsAre("a.yaml", "b.yaml"));
}

TEST_F(Install, HiddenNameIsRefused) {
  const std::string path = source(".a.yaml", kGood);
  expectRefusal(install({path}), "'" + path + "': not a name for an installed file", 2);
}

TEST_F(Install, TwoFilesWithOneNameAreRefused) {
  fs::create_directory(world.folder() / "other");
  const std::string first = source("a.yaml", kGood);
  const std::string second = source("other/a.yaml", kOther);
  expectRefusal(install({first, second}), second + ": another file of this name is given too", 2);
}

TEST_F(Install, ReadersSeeTheOldOrTheNewFileOnly) {
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

TEST_F(Install, MarkOptionMarksTheFileInPlace) {
  const std::string path = source("a.yaml", kGood);
  EXPECT_EQ(install({"--mark", path}).status, 0);
  EXPECT_EQ(markOf(path), "\x01");
  EXPECT_EQ(world.poolctl({"list", path}).status, 0);
  EXPECT_FALSE(fs::exists(world.etc() / "rp.d"));
}

TEST_F(Install, MarkWithAnotherValueIsReplaced) {
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

TEST_F(Install, FailingMarkIsExplainedAndOthersAreUndone) {
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

TEST_F(Install, RemoveRemovesTheNamedFilesOnly) {
  install({source("a.yaml", kGood), source("b.yaml", kOther), source("c.yaml", kGood)});
  EXPECT_EQ(install({"--remove", "a.yaml", "c.yaml"}).status, 0);
  EXPECT_THAT(entriesOf(world.rpD()), ElementsAre("b.yaml"));
}

TEST_F(Install, RemoveOfAMissingNameRemovesNone) {
  install({source("a.yaml", kGood)});
  expectRefusal(install({"--remove", "a.yaml", "b.yaml"}),
                "/etc/rp.d/b.yaml: No such file or directory", 3);
  EXPECT_THAT(entriesOf(world.rpD()), ElementsAre("a.yaml"));
}

TEST_F(Install, RemoveOfOneNameTwiceRemovesNone) {
  install({source("a.yaml", kGood)});
  EXPECT_EQ(install({"--remove", "a.yaml", "a.yaml"}).status, 1);
  EXPECT_EQ(readFile(world.rpD() / "a.yaml"), kGood);
  EXPECT_EQ(markOf(world.rpD() / "a.yaml"), "\x01");
}

TEST_F(Install, RemoveRefusesPathsAndHiddenNames) {
  install({source("a.yaml", kGood)});
  for (const char *name : {"./a.yaml", "/etc/rp.d/a.yaml", "../passwd", ".", "..", ".a", ""}) {
    expectRefusal(install({"--remove", name}),
                  "'" + std::string(name) + "': not a name for an installed file", 2);
  }
}

TEST_F(Install, RemoveRefusesASymbolicLink) {
  fs::create_symlink("/dev/null", world.rpD() / "link");
  expectRefusal(install({"--remove", "link"}), "/etc/rp.d/link: not a regular file");
}

TEST_F(Install, RemoveWithoutAFolderFails) {
  expectRefusal(install({"--remove", "a.yaml"}), "/etc/rp.d: No such file or directory", 3);
}

TEST_F(Install, FifoIsRefusedWithoutWaiting) {
  const std::string path = (world.folder() / "fifo.yaml").string();
  ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
  expectRefusal(install({path}), path + ": not a regular file");
  expectRefusal(install({"--mark", path}), path + ": not a regular file");
}

TEST_F(Install, DeviceIsRefused) {
  expectRefusal(install({"/dev/zero"}), "/dev/zero: not a regular file");
}

TEST_F(Install, FileLargerThan64MBIsRefused) {
  const std::string path = source("a.yaml", "# ");
  fs::resize_file(path, (64U << 20U) + 1);
  expectRefusal(install({path}),
                path + ": larger than 64 MB, the most that a definition file may have");
  EXPECT_FALSE(fs::exists(world.etc() / "rp.d"));
}

TEST_F(Install, MoreFilesThanAProcessMayHaveOpenAreInstalled) {
  Arguments paths{"64", "poolctl-install"};
  for (int i = 0; i < 100; ++i) {
    const std::string number = std::to_string(i);
    paths.push_back(source("f" + number + ".yaml", "- name: p" + number + "\n  memMin: 1\n"));
  }
  (void)world.etc();
  const auto limited = [&](const Arguments &arguments) {
    Arguments all{"-c", "ulimit -n $0; exec \"$@\""};
    all.insert(all.end(), arguments.begin(), arguments.end());
    return world.run("/bin/sh", all);
  };
  const ProcessResult installed = limited(paths);
  EXPECT_EQ(installed.status, 0) << installed.err;
  EXPECT_EQ(entriesOf(world.rpD()).size(), 100U);
  paths.insert(paths.begin() + 2, "--mark");
  EXPECT_EQ(limited(paths).status, 0);
  EXPECT_EQ(markOf(paths.back()), "\x01");
}

TEST_F(Install, FolderThatOthersMayChangeIsNamedInAWarning) {
  fs::permissions(world.rpD(), fs::perms::others_write, fs::perm_options::add);
  const ProcessResult result = install({source("a.yaml", kGood)});
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(result.err,
            "poolctl-install: warning: /etc/rp.d: other users may change the definition files in "
            "it\n");
}

TEST_F(Install, VersionGoesToStandardOutput) {
  const ProcessResult result = install({"--version"});
  EXPECT_EQ(result.status, 0);
  EXPECT_THAT(result.out,
              testing::MatchesRegex("poolctl-install \\(poolctl\\) [0-9]+\\.[0-9.]+\n"));
}

TEST_F(Install, HelpGoesToStandardOutput) {
  const ProcessResult result = install({"--help"});
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(result.err, "");
  for (const char *word : {"FILE", "--mark", "--remove", "Exit status"})
    EXPECT_THAT(result.out, HasSubstr(word));
}

TEST_F(Install, WrongUsageExitsWith2AndChangesNothing) {
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
