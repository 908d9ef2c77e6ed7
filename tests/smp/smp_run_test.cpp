// SPDX-License-Identifier: Apache-2.0
// The machine that the other tests of this folder run in (smp-run), seen from outside. A fake QEMU
// and fake images take the place of the real ones, so nothing boots.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "process.h"
#include "temp_folder.h"
#include "world.h"

namespace Smp {
namespace {

namespace fs = std::filesystem;
using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;

// Finds the files of the machine's serial line and ports in QEMU's command line.
constexpr const char *kFindFiles =
    "#!/bin/sh\n"
    "for word; do\n"
    "  case $word in\n"
    "    file:*) console=${word#file:} ;;\n"
    "    file,id=out,path=*) out=${word##*path=} ;;\n"
    "    file,id=err,path=*) err=${word##*path=} ;;\n"
    "    file,id=status,path=*) status=${word##*path=} ;;\n"
    "  esac\n"
    "done\n";

class SmpRun : public testing::Test {
 protected:
  SmpRun() {
    fs::create_directory(bin());
    for (const char *name : {"smp-run", "init"})
      fs::copy_file(fs::path(SMP_FOLDER) / name, world.folder() / name);
    images("echo " + world.folder().string());
    world.environment["PATH"] = bin().string() + ":" + world.environment["PATH"];
    world.environment.erase("CI");
  }

  void qemu(const std::string &script) {
    program(bin() / "qemu-system-x86_64", kFindFiles + script + "\n");
  }
  void images(const std::string &script) {
    program(world.folder() / "images", "#!/bin/sh\n" + script + "\n");
  }

  ::Test::ProcessResult run(::Test::Arguments arguments = {"--limit=30", "--", "true"}) {
    ::Test::Command command;
    command.program = world.folder() / "smp-run";
    command.arguments = std::move(arguments);
    command.environment = world.environment;
    command.workingFolder = world.folder();
    return ::Test::run(command);
  }

  fs::path bin() { return world.folder() / "bin"; }

  ::Test::World world;

 private:
  static void program(const fs::path &path, const std::string &text) {
    ::Test::writeFile(path, text);
    fs::permissions(path, fs::perms::owner_all);
  }
};

TEST_F(SmpRun, TheCommandsStreamsAndStatusComeOut) {
  qemu("printf 'o\\n' >$out; printf 'e\\n' >$err; echo 'status 42' >$status; echo noise >$console");
  const auto result = run();
  EXPECT_EQ(result.status, 42);
  EXPECT_EQ(result.out, "o\n");
  EXPECT_EQ(result.err, "e\n");
}

TEST_F(SmpRun, AMachineWithoutAVerdictFailsAndShowsItsConsole) {
  qemu("echo 'Kernel panic - not syncing' >$console; echo half >$out");
  const auto result = run();
  EXPECT_EQ(result.status, 125);
  EXPECT_EQ(result.out, "half\n");
  EXPECT_THAT(result.err, HasSubstr("Kernel panic - not syncing"));
  EXPECT_THAT(result.err, HasSubstr("ended without a verdict"));
}

TEST_F(SmpRun, AMachineThatQemusOwnFaultEndedBootsAgain) {
  qemu(
      "[ -e $0.first ] && { echo 'status 0' >$status; exit; }\n"
      "touch $0.first; echo 'Oops: int3: 0000 [#1] PREEMPT SMP' >$console; echo half >$out");
  const auto result = run();
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(result.out, "");
  EXPECT_THAT(result.err, HasSubstr("attempt 1: QEMU executed a breakpoint"));
}

TEST_F(SmpRun, ThatFaultThreeTimesIsAFailure) {
  qemu("echo 'Oops: int3: 0000 [#1] PREEMPT SMP' >$console; echo x >>$0.boots");
  EXPECT_EQ(run().status, 125);
  EXPECT_EQ(::Test::readFile(bin() / "qemu-system-x86_64.boots"), "x\nx\nx\n");
}

TEST_F(SmpRun, AMachineThatQemuCannotStartFailsWithQemusReason) {
  qemu("echo 'cannot set up guest memory' >&2; exit 1");
  const auto result = run();
  EXPECT_EQ(result.status, 125);
  EXPECT_THAT(result.err, HasSubstr("cannot set up guest memory"));
}

TEST_F(SmpRun, TheTimeLimitFailsShowsTheConsoleAndLeavesNothing) {
  qemu("echo booting >$console; exec sleep 60");
  const auto result = run({"--limit=2", "--", "true"});
  EXPECT_EQ(result.status, 124);
  EXPECT_THAT(result.err, HasSubstr("booting"));
  EXPECT_THAT(result.err, HasSubstr("smp-run: not done within 2 s"));
  for (const auto &entry : fs::directory_iterator(world.environment["TMPDIR"]))
    EXPECT_THAT(entry.path().filename().string(), Not(StartsWith("smp-run.")));
}

TEST_F(SmpRun, AVerdictCountsEvenWhereTheMachineDoesNotSwitchItselfOff) {
  qemu("echo 'status 3' >$status; exec sleep 60");
  EXPECT_EQ(run({"--limit=2", "--", "true"}).status, 3);
}

TEST_F(SmpRun, WithoutImagesItIsSkippedWithTheReasonAndFailsInCi) {
  qemu("exit 1");
  images("echo mmdebstrap is not installed; exit 77");
  auto result = run();
  EXPECT_EQ(result.status, 77);
  EXPECT_EQ(result.out, "SKIPPED: no QEMU machine starts here: mmdebstrap is not installed\n");
  world.environment["CI"] = "true";
  result = run();
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.out, StartsWith("SKIPPED: "));
}

TEST_F(SmpRun, WithoutQemuItIsSkippedWithTheReason) {
  for (const char *name : {"bash", "dirname"})
    fs::create_symlink(fs::path("/usr/bin") / name, bin() / name);
  world.environment["PATH"] = bin().string();
  const auto result = run();
  EXPECT_EQ(result.status, 77);
  EXPECT_THAT(result.out, StartsWith("SKIPPED: no QEMU machine starts here: qemu-system-x86_64"));
}

TEST_F(SmpRun, ImagesThatCannotBeMadeAreAFailureAndNoSkip) {
  qemu("exit 1");
  images("echo the disk is full >&2; exit 1");
  const auto result = run();
  EXPECT_EQ(result.status, 125);
  EXPECT_THAT(result.err, HasSubstr("the disk is full"));
}

TEST_F(SmpRun, TheCommandSeesTheFilesThatAreNamed) {
  // Reads the second disk, as the machine would.
  qemu(
      "for word; do case $word in file=*job.ext4*) job=${word#file=} ;; esac; done\n"
      "/sbin/debugfs -R \"cat /files" +
      world.folder().string() + "/wanted\" ${job%%,*} >$out 2>$err; echo 'status 0' >$status");
  ::Test::writeFile(world.folder() / "wanted", "content\n");
  const auto result =
      run({"--file=" + (world.folder() / "wanted").string(), "--limit=30", "--", "true"});
  EXPECT_EQ(result.out, "content\n") << result.err;
}

TEST_F(SmpRun, WrongUsageEndsWith125) {
  for (const ::Test::Arguments &arguments :
       {::Test::Arguments{}, ::Test::Arguments{"--"}, ::Test::Arguments{"--mem=lots", "true"},
        ::Test::Arguments{"--cpus=0", "true"}, ::Test::Arguments{"--kernel=x", "true"},
        ::Test::Arguments{"--file=/no/such/file/there", "true"},
        ::Test::Arguments{"--unknown", "true"}})
    EXPECT_EQ(run(arguments).status, 125) << testing::PrintToString(arguments);
}

}  // namespace
}  // namespace Smp
