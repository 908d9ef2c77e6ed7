// SPDX-License-Identifier: Apache-2.0
// The machine that the other tests of this folder run in (uml-run), seen from outside.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>

#include "process.h"
#include "temp_folder.h"
#include "world.h"

namespace Uml {
namespace {

namespace fs = std::filesystem;
using testing::HasSubstr;
using testing::StartsWith;

class Machine : public testing::Test {
 protected:
  Machine() {
    if (const char *ci = getenv("CI")) world.environment["CI"] = ci;
  }

  ::Test::ProcessResult run(::Test::Arguments arguments, const std::string &program = UML_RUN) {
    ::Test::Command command;
    command.program = program;
    command.arguments = std::move(arguments);
    command.environment = world.environment;
    command.workingFolder = world.folder();
    return ::Test::run(command);
  }

  ::Test::ProcessResult inMachine(const std::string &script, ::Test::Arguments options = {}) {
    options.insert(options.end(), {"--", "sh", "-c", script});
    return run(options);
  }

  ::Test::World world;
};

#define SKIP_WITHOUT_MACHINE(result) \
  if ((result).status == 77) GTEST_SKIP() << (result).out

TEST_F(Machine, TheCommandsStreamsAndStatusComeOutAsTheyAre) {
  const auto result = inMachine("printf 'a\\tb\\r\\n\\303\\244'; printf 'e\\n' >&2; exit 42");
  SKIP_WITHOUT_MACHINE(result);
  EXPECT_EQ(result.out, "a\tb\r\n\xc3\xa4");
  EXPECT_EQ(result.err, "e\n");
  EXPECT_EQ(result.status, 42);
}

TEST_F(Machine, LongOutputComesOutWhole) {
  const auto result = inMachine("seq 1 30000; seq 1 3000 >&2");
  SKIP_WITHOUT_MACHINE(result);
  EXPECT_EQ(::Test::lines(result.out).size(), 30000u);
  EXPECT_EQ(::Test::lines(result.out).back(), "30000");
  EXPECT_EQ(::Test::lines(result.err).size(), 3000u);
}

TEST_F(Machine, ItIsAKernelOfItsOwnWithTheControllersThatPoolsNeed) {
  const auto result = inMachine("cat /sys/fs/cgroup/cgroup.controllers /proc/cpuinfo; id -u");
  SKIP_WITHOUT_MACHINE(result);
  EXPECT_THAT(result.out, HasSubstr("memory"));
  EXPECT_THAT(result.out, HasSubstr("cpu"));
  EXPECT_THAT(result.out, HasSubstr("User Mode Linux"));
  EXPECT_EQ(::Test::lines(result.out).back(), "0");
}

TEST_F(Machine, ItHasTheMemoryThatWasAskedFor) {
  const auto result =
      inMachine("sed -n 's/MemTotal: *\\([0-9]*\\) kB/\\1/p' /proc/meminfo", {"--mem=256M"});
  SKIP_WITHOUT_MACHINE(result);
  const int kilobytes = std::stoi(result.out);
  EXPECT_LT(kilobytes, 256 * 1024);
  EXPECT_GT(kilobytes, 200 * 1024);
}

TEST_F(Machine, NothingOfThisMachinesFilesCanBeChanged) {
  const fs::path file = world.folder() / "file";
  ::Test::writeFile(file, "as it was");
  const auto result =
      inMachine("echo changed >" + file.string() + "; rm -f " + file.string() + "; mkdir " +
                (world.folder() / "new").string() + "; cat " + file.string());
  SKIP_WITHOUT_MACHINE(result);
  EXPECT_EQ(result.out, "as it was");
  EXPECT_EQ(::Test::readFile(file), "as it was");
  EXPECT_FALSE(fs::exists(world.folder() / "new"));
}

TEST_F(Machine, AFolderThatIsNamedCanBeWritten) {
  const auto result = inMachine("echo new >" + (world.folder() / "new").string(),
                                {"--writable=" + world.folder().string()});
  SKIP_WITHOUT_MACHINE(result);
  EXPECT_EQ(::Test::readFile(world.folder() / "new"), "new\n");
}

TEST_F(Machine, ItsTmpdirIsAFileSystemThatTakesExtendedAttributes) {
  const auto result = inMachine("stat -f -c %T $TMPDIR; mount | grep -c \"$TMPDIR.*ext4\"");
  SKIP_WITHOUT_MACHINE(result);
  EXPECT_EQ(result.out, "ext2/ext3\n1\n") << result.err;
}

TEST_F(Machine, TheTimeLimitEndsItAndLeavesNothing) {
  const auto result = inMachine("echo begun; while :; do :; done", {"--limit=6"});
  SKIP_WITHOUT_MACHINE(result);
  EXPECT_EQ(result.status, 124);
  EXPECT_EQ(result.out, "begun\n");
  EXPECT_THAT(result.err, HasSubstr("uml-run: not done within 6 s"));
  for (const auto &entry : fs::directory_iterator(world.folder()))
    EXPECT_THAT(entry.path().filename().string(), Not(StartsWith("uml-run.")));
}

TEST_F(Machine, ACommandThatIsNotThereEndsWith127) {
  const auto result = run({"--", "/no/such/command"});
  SKIP_WITHOUT_MACHINE(result);
  EXPECT_EQ(result.status, 127);
}

TEST_F(Machine, AnOrdinaryUserCanHaveOne) {
  if (geteuid() != 0) return;  // the other tests have shown it
  // Where that user can read it, whatever the folder of the sources allows.
  const ::Test::TempFolder folder;
  for (const char *name : {"uml-run", "init"})
    fs::copy_file(fs::path(UML_RUN).parent_path() / name, folder.path() / name);
  fs::permissions(folder.path(), fs::perms::all);
  world.environment["TMPDIR"] = folder.path();
  world.environment["HOME"] = "/nonexistent";
  fs::permissions(world.folder(), fs::perms::all);
  const auto result =
      run({"--reuid=65534", "--regid=65534", "--clear-groups", (folder.path() / "uml-run").string(),
           "--", "sh", "-c", "id -u; mkdir /sys/fs/cgroup/host; echo x >$TMPDIR/f; ls $TMPDIR/f"},
          "/usr/bin/setpriv");
  SKIP_WITHOUT_MACHINE(result);
  EXPECT_EQ(result.status, 0) << result.err;
  EXPECT_EQ(::Test::lines(result.out).front(), "0");
}

TEST_F(Machine, WhereNoneCanStartThatIsSaidAloudAndIsAFailureInCi) {
  fs::create_directory(world.folder() / "bin");
  for (const char *name : {"bash", "mkdir", "dirname", "env"})
    fs::create_symlink(fs::path("/usr/bin") / name, world.folder() / "bin" / name);
  world.environment["PATH"] = (world.folder() / "bin").string();
  world.environment.erase("CI");
  auto result = run({"--", "true"});
  EXPECT_EQ(result.status, 77);
  EXPECT_THAT(result.out, StartsWith("SKIPPED: no user-mode Linux machine starts here: "));
  world.environment["CI"] = "true";
  result = run({"--", "true"});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.out, StartsWith("SKIPPED: "));
}

TEST_F(Machine, AKernelThatEndsBeforeItsFirstProcessIsNoMachine) {
  fs::create_directory(world.folder() / "bin");
  const fs::path broken = world.folder() / "bin" / "linux.uml";
  ::Test::writeFile(broken, "#!/bin/sh\necho no ptrace here\nexit 1\n");
  fs::permissions(broken, fs::perms::owner_all);
  world.environment["PATH"] = (world.folder() / "bin").string() + ":" + world.environment["PATH"];
  world.environment.erase("CI");
  const auto result = run({"--", "true"});
  EXPECT_EQ(result.status, 77);
  EXPECT_THAT(result.out, HasSubstr("linux.uml ended with status 1"));
  EXPECT_THAT(result.err, HasSubstr("no ptrace here"));
}

TEST_F(Machine, OneWhoseFirstProcessRanIsBrokenAndNotSkipped) {
  SKIP_WITHOUT_MACHINE(inMachine("true"));
  fs::create_directory(world.folder() / "bin");
  const fs::path mount = world.folder() / "bin" / "mount";
  ::Test::writeFile(mount,
                    "#!/bin/sh\n"
                    "case $* in *hostfs*) exec /usr/bin/mount -r \"$@\" ;; esac\n"
                    "exec /usr/bin/mount \"$@\"\n");
  fs::permissions(mount, fs::perms::owner_all);
  world.environment["PATH"] = (world.folder() / "bin").string() + ":" + world.environment["PATH"];
  const auto result = run({"--", "true"});
  EXPECT_EQ(result.status, 125);
  EXPECT_THAT(result.out, Not(HasSubstr("SKIPPED")));
  EXPECT_THAT(result.err, HasSubstr("the machine broke"));
}

TEST_F(Machine, WrongUsageEndsWith125) {
  for (const ::Test::Arguments &arguments :
       {::Test::Arguments{}, ::Test::Arguments{"--"}, ::Test::Arguments{"--mem=lots", "true"},
        ::Test::Arguments{"--limit=x", "true"}, ::Test::Arguments{"--unknown", "true"}})
    EXPECT_EQ(run(arguments).status, 125) << testing::PrintToString(arguments);
}

}  // namespace
}  // namespace Uml
