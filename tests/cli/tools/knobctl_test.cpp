// SPDX-License-Identifier: Apache-2.0
// knobctl as its users run it, on an emulated kernel of 4 CPUs and 8192 MB.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <pty.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <string>

#include "common/sqlite.h"
#include "knob/session.h"
#include "temp_folder.h"
#include "world.h"

namespace {

using ::Test::Arguments;
using ::Test::lines;
using ::Test::ProcessResult;
using ::Test::withoutFolder;
using ::Test::World;
using ::Test::writeFile;
using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;
namespace fs = std::filesystem;

// A process that lives for as long as a test holds it.
class Sleeper {
 public:
  Sleeper() : pid_(fork()) {
    if (pid_ == 0) {
      for (;;) pause();
    }
  }
  Sleeper(const Sleeper &) = delete;
  Sleeper &operator=(const Sleeper &) = delete;
  ~Sleeper() { end(); }

  void end() {
    if (pid_ <= 0) return;
    (void)kill(pid_, SIGKILL);
    (void)waitpid(pid_, nullptr, 0);
    pid_ = 0;
  }

  std::string number() const { return std::to_string(pid_); }

 private:
  pid_t pid_;
};

class Knobctl : public testing::Test {
 protected:
  Knobctl() { EXPECT_EQ(out({"boot", "--cpus", "4", "--memory", "8192"}), ""); }

  ProcessResult run(const Arguments &arguments) const { return world_.run("knobctl", arguments); }

  std::string out(const Arguments &arguments) const {
    const ProcessResult result = run(arguments);
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.err, "");
    return withoutFolder(result.out, world_);
  }

  std::string err(int status, const Arguments &arguments) const {
    const ProcessResult result = run(arguments);
    EXPECT_EQ(result.status, status);
    EXPECT_EQ(result.out, "");
    return withoutFolder(result.err, world_);
  }

  void configure(const std::string &text) const { writeFile(world_.folder() / "knob.conf", text); }

  // The kernel itself, for what no command of the tool can do.
  std::unique_ptr<Knob::Kernel> kernel() const {
    Knob::Configuration configuration;
    configuration.statePath = (world_.folder() / "kernel.db").string();
    return Knob::openKernel(configuration);
  }

  void allocate(const std::string &path, Knob::Resource resource,
                const Knob::AllocationChange &change) const {
    const auto own = kernel();
    own->setAllocation(own->lookUp(path), resource, change);
  }

  // Changes the state without the kernel, and without the copy of its facts.
  void changeState(const char *sql) const {
    Platform::Database(world_.folder() / "kernel.db", Platform::Database::Mode::kReadWrite, 1000)
        .execute(sql);
    fs::remove(world_.folder() / "kernel.db-facts");
  }

  World world_;
};

Knob::AllocationChange minAndMax(int64_t min, int64_t max) {
  Knob::AllocationChange change;
  change.min = min;
  change.max = max;
  return change;
}

TEST_F(Knobctl, GroupsAreMadeAndDeleted) {
  EXPECT_EQ(out({"create", "host/opt/a"}), "");
  EXPECT_EQ(out({"create", "host/opt/a/b"}), "");
  EXPECT_THAT(out({"stats", "host/opt/a/b"}),
              StartsWith("group                     host/opt/a/b\n"));
  EXPECT_EQ(out({"delete", "host/opt/a/b"}), "");
  EXPECT_EQ(out({"delete", "host/opt/a"}), "");
  EXPECT_EQ(err(3, {"stats", "host/opt/a"}), "knobctl: stats host/opt/a: not found\n");
}

TEST_F(Knobctl, WhatIsNotThereIsStatus3) {
  EXPECT_EQ(err(3, {"delete", "host/none"}), "knobctl: delete host/none: not found\n");
  EXPECT_EQ(err(3, {"create", "host/none/a"}),
            "knobctl: create host/none/a: not found: host/none\n");
  EXPECT_EQ(err(3, {"tree", "host/none"}), "knobctl: tree host/none: not found\n");
  EXPECT_EQ(err(3, {"tree", ""}), "knobctl: tree : not found\n");
  EXPECT_THAT(err(3, {"join", "host/opt", "4194305"}),
              StartsWith("knobctl: join host/opt 4194305: "));
}

TEST_F(Knobctl, WhatTheKernelRefusesIsStatus1) {
  EXPECT_EQ(out({"create", "host/opt/a"}), "");
  EXPECT_EQ(err(1, {"create", "host/opt/a"}), "knobctl: create host/opt/a: already exists\n");
  for (const char *path :
       {"host/opt/..", "host/opt/.", "host/opt/", "host/opt/memory.min", "a", ""}) {
    EXPECT_THAT(err(1, {"create", path}), HasSubstr("bad parameter")) << path;
  }
  EXPECT_THAT(err(1, {"delete", "host"}), HasSubstr("permission denied"));
  EXPECT_THAT(err(1, {"delete", "host/opt"}), HasSubstr("permission denied"));
}

TEST_F(Knobctl, WhatIsInUseIsStatus4) {
  Sleeper sleeper;
  EXPECT_EQ(out({"create", "host/opt/a"}), "");
  EXPECT_EQ(out({"create", "host/opt/a/b"}), "");
  EXPECT_THAT(err(4, {"delete", "host/opt/a"}), StartsWith("knobctl: delete host/opt/a: busy"));
  EXPECT_THAT(err(4, {"join", "host/opt/a", sleeper.number()}), HasSubstr("busy"));
  EXPECT_EQ(out({"join", "host/opt/a/b", sleeper.number()}), "");
  EXPECT_THAT(out({"stats", "host/opt/a/b"}),
              HasSubstr("process                   " + sleeper.number() + "\n"));
  EXPECT_THAT(err(4, {"delete", "host/opt/a/b"}), HasSubstr("busy"));
  sleeper.end();
  EXPECT_EQ(out({"delete", "host/opt/a/b"}), "");
}

TEST_F(Knobctl, StatsPrintsAllThatIsKnownOfAGroup) {
  EXPECT_EQ(out({"create", "host/opt/a"}), "");
  Knob::AllocationChange memory = minAndMax(512, 1024);
  memory.shares = -4;
  memory.minLimit = 600;
  allocate("host/opt/a", Knob::Resource::kMemory, memory);
  Knob::AllocationChange cpu = minAndMax(50, 150);
  cpu.shares = 77;
  allocate("host/opt/a", Knob::Resource::kCpu, cpu);
  EXPECT_THAT(out({"stats", "host/opt/a"}), HasSubstr("memory min MB             512\n"
                                                      "memory max MB             1024\n"
                                                      "memory minLimit MB        600\n"
                                                      "memory shares             high\n"
                                                      "memory reservation MB     512\n"
                                                      "memory own peak KB        524288\n"
                                                      "memory children peak KB   0\n"
                                                      "CPU min %                 50\n"
                                                      "CPU max %                 150\n"
                                                      "CPU minLimit %            none\n"
                                                      "CPU shares                77\n"
                                                      "CPU reservation %         50\n"));
  EXPECT_THAT(out({"stats", "host"}), HasSubstr("memory children peak KB   524288\n"));
}

TEST_F(Knobctl, SetChangesWhatIsGivenAndNothingElse) {
  EXPECT_EQ(out({"create", "host/opt/a"}), "");
  EXPECT_EQ(out({"set", "host/opt/a", "--mem-min", "512", "--mem-max", "1024", "--mem-min-limit",
                 "600", "--mem-shares", "high", "--cpu-min", "50", "--cpu-max", "150",
                 "--cpu-min-limit", "60", "--cpu-shares", "77"}),
            "");
  EXPECT_EQ(out({"set", "host/opt/a", "--mem-max", "none", "--cpu-min", "0"}), "");
  EXPECT_THAT(out({"stats", "host/opt/a"}), HasSubstr("memory min MB             512\n"
                                                      "memory max MB             none\n"
                                                      "memory minLimit MB        600\n"
                                                      "memory shares             high\n"));
  EXPECT_THAT(out({"stats", "host/opt/a"}), HasSubstr("CPU min %                 0\n"
                                                      "CPU max %                 150\n"
                                                      "CPU minLimit %            60\n"
                                                      "CPU shares                77\n"));
}

TEST_F(Knobctl, SetReportsWhyItIsRefusedAndChangesNothing) {
  EXPECT_EQ(out({"create", "host/opt/a"}), "");
  EXPECT_EQ(err(1, {"set", "host/opt/a", "--mem-min", "300", "--mem-max", "200"}),
            "knobctl: set host/opt/a: memory: bad parameter: min 300 is above max 200\n");
  EXPECT_THAT(err(1, {"set", "host/opt/a", "--mem-min", "8193"}),
              StartsWith("knobctl: set host/opt/a: memory: reservation refused"));
  EXPECT_EQ(err(3, {"set", "host/opt/b", "--mem-min", "1"}),
            "knobctl: set host/opt/b: not found\n");
  EXPECT_THAT(out({"stats", "host/opt/a"}), HasSubstr("memory min MB             0\n"));
}

TEST_F(Knobctl, SetPutsTheMemoryBackWhenTheCpuIsRefused) {
  EXPECT_EQ(out({"create", "host/opt/a"}), "");
  EXPECT_EQ(out({"set", "host/opt/a", "--mem-min", "5", "--mem-max", "64"}), "");
  EXPECT_THAT(err(1, {"set", "host/opt/a", "--mem-min", "7", "--cpu-min", "401"}),
              StartsWith("knobctl: set host/opt/a: CPU: reservation refused"));
  EXPECT_THAT(out({"stats", "host/opt/a"}), HasSubstr("memory min MB             5\n"
                                                      "memory max MB             64\n"));
}

TEST_F(Knobctl, SetRefusesValuesThatAreNotAmounts) {
  EXPECT_THAT(err(2, {"set", "host/opt"}), HasSubstr("no setting is given"));
  for (const char *value : {"-1", "x", "", "1.5", "none", "9223372036854775808"}) {
    EXPECT_THAT(err(2, {"set", "host/opt", "--mem-min", value}),
                HasSubstr("is not a number from 0 up"))
        << value;
  }
  EXPECT_THAT(err(2, {"set", "host/opt", "--cpu-shares", "huge"}),
              HasSubstr("\"huge\" is not low, normal, high or a number from 0 up"));
}

TEST_F(Knobctl, TreeAlignsGroupsAndDrawsThemAgainstTheMachine) {
  EXPECT_EQ(out({"create", "host/opt/z"}), "");
  EXPECT_EQ(out({"create", "host/opt/backup"}), "");
  allocate("host/opt/backup", Knob::Resource::kMemory, minAndMax(2048, 4096));
  allocate("host/opt/backup", Knob::Resource::kCpu, minAndMax(0, 100));
  allocate("host/opt/z", Knob::Resource::kCpu, minAndMax(1, -1));
  EXPECT_EQ(out({"tree"}),
            // clang-format off
      "GROUP       MEM MIN   MAX  RESERVED  USED  OF 8192 MB              CPU MIN  MAX  RESERVED  USED S  OF 400 %                PROCESSES\n"
      "host              0     -      2048     0  [#####...............]        0    -         1       -  [#...................]          0\n"
      "  opt             0     -      2048     0  [#####...............]        0    -         1       -  [#...................]          0\n"
      "    backup     2048  4096      2048     0  [#####.....|.........]        0  100         0       -  [.....|..............]          0\n"
      "    z             0     -         0     0  [....................]        1    -         1       -  [#...................]          0\n");
  // clang-format on
}

TEST_F(Knobctl, TreeCanBeginBelowTheRoot) {
  EXPECT_EQ(out({"create", "host/opt/a"}), "");
  const auto rows = lines(out({"tree", "host/opt"}));
  ASSERT_EQ(rows.size(), 3U);
  EXPECT_THAT(rows[1], StartsWith("opt "));
  EXPECT_THAT(rows[2], StartsWith("  a "));
}

TEST_F(Knobctl, TreeKeepsItsColumnsWhateverTheNames) {
  for (const char *name : {"gr\xc3\xbcn", "\xe6\xbc\xa2\xe5\xad\x97", "a\x1b[31m\tb", "\xff\xfe"}) {
    EXPECT_EQ(out({"create", std::string("host/opt/") + name}), "");
  }
  const std::string text = out({"tree"});
  EXPECT_THAT(text, HasSubstr("    a\\x1b[31m\\tb        0"));
  EXPECT_THAT(text, HasSubstr("    gr\xc3\xbcn                0"));
  EXPECT_THAT(text, HasSubstr("    \xe6\xbc\xa2\xe5\xad\x97                0"));
  EXPECT_THAT(text, HasSubstr("    \\xff\\xfe            0"));
  for (const char byte : text)
    EXPECT_TRUE(byte == '\n' || static_cast<unsigned char>(byte) >= 0x20);
}

// What a program writes to a terminal of its own.
std::string onTerminal(const World &world, const Arguments &arguments, const char *terminal) {
  int master = -1;
  const pid_t child = forkpty(&master, nullptr, nullptr, nullptr);
  if (child == 0) {
    setenv("KNOB_CONF", world.environment.at("KNOB_CONF").c_str(), 1);
    setenv("TERM", terminal, 1);
    unsetenv("NO_COLOR");
    const std::string program = (::Test::binFolder() / "knobctl").string();
    std::vector<const char *> words = {program.c_str()};
    for (const std::string &argument : arguments) words.push_back(argument.c_str());
    words.push_back(nullptr);
    execv(program.c_str(), const_cast<char *const *>(words.data()));
    _exit(127);
  }
  std::string text;
  char buffer[4096];
  for (ssize_t count = 1; count > 0;) {
    count = read(master, buffer, sizeof buffer);  // an error once the program has ended
    if (count > 0) text.append(buffer, static_cast<size_t>(count));
  }
  close(master);
  (void)waitpid(child, nullptr, 0);
  return text;
}

TEST_F(Knobctl, TreeIsColouredOnATerminalThatCanShowIt) {
  EXPECT_THAT(onTerminal(world_, {"tree"}, "xterm"), HasSubstr("[\033[32m"));
  EXPECT_THAT(onTerminal(world_, {"tree"}, "dumb"), Not(HasSubstr("\033")));
  EXPECT_THAT(out({"tree"}), Not(HasSubstr("\033")));
}

TEST_F(Knobctl, BootSetsTheFacts) {
  EXPECT_EQ(out({"boot", "--cpus", "3", "--memory", "1000", "--max-vms", "7", "--vm", "--cmdline",
                 "quiet x=\"1\""}),
            "");
  EXPECT_EQ(out({"facts"}),
            "CPUs                      3\n"
            "memory KB                 1024000\n"
            "virtual machines at most  7\n"
            "is a virtual machine      yes\n"
            "boot command line         quiet x=\"1\"\n");
  EXPECT_EQ(out({"boot", "--cmdline", ""}), "");
  EXPECT_THAT(out({"facts"}), HasSubstr("boot command line         \n"));
}

TEST_F(Knobctl, BootOnAKernelWithGroupsNeedsForce) {
  EXPECT_EQ(out({"create", "host/opt/a"}), "");
  EXPECT_THAT(err(4, {"boot"}), StartsWith("knobctl: boot: busy"));
  EXPECT_THAT(out({"stats", "host/opt/a"}), HasSubstr("host/opt/a"));
  EXPECT_EQ(out({"boot", "--force"}), "");
  EXPECT_EQ(err(3, {"stats", "host/opt/a"}), "knobctl: stats host/opt/a: not found\n");
}

TEST_F(Knobctl, BootRefusesAMachineThatCannotBe) {
  EXPECT_THAT(err(1, {"boot", "--cpus", "0"}), HasSubstr("bad parameter"));
  EXPECT_THAT(err(1, {"boot", "--memory", "0"}), HasSubstr("bad parameter"));
  EXPECT_THAT(err(1, {"boot", "--cmdline", std::string(4096, 'x')}), HasSubstr("bad parameter"));
  EXPECT_THAT(err(2, {"boot", "--cpus", "many"}), HasSubstr("--cpus"));
  EXPECT_THAT(err(2, {"boot", "--cpus", "-1"}), HasSubstr("--cpus"));
}

TEST_F(Knobctl, StatusTellsWhichKernelAndThatItCanBeUsed) {
  const auto rows = lines(out({"status"}));
  ASSERT_EQ(rows.size(), 6U);
  EXPECT_EQ(rows[0], "configuration             FOLDER/knob.conf");
  EXPECT_EQ(rows[1], "kernel                    emulated");
  EXPECT_THAT(rows[2], StartsWith("library's signature       "));
  EXPECT_EQ(rows[3], "state                     FOLDER/kernel.db");
  EXPECT_EQ(rows[4].substr(26), rows[2].substr(26));
  EXPECT_EQ(rows[5], "condition                 usable");
}

TEST_F(Knobctl, StatusDoesNotMakeAStateThatIsNotThere) {
  const fs::path state = world_.folder() / "later.db";
  configure("state = " + state.string() + "\n");
  EXPECT_THAT(out({"status"}), HasSubstr("FOLDER/later.db (none yet; the first use makes it)\n"));
  EXPECT_FALSE(fs::exists(state));
}

TEST_F(Knobctl, StatusNamesTheLineOfABadConfiguration) {
  configure("# one\nkernel = best\n");
  EXPECT_THAT(err(1, {"status"}),
              StartsWith("knobctl: kernel not usable: FOLDER/knob.conf:2: kernel: bad value"));
  EXPECT_THAT(err(1, {"tree"}),
              StartsWith("knobctl: tree host: kernel not usable: FOLDER/knob.conf:2: "));
}

TEST_F(Knobctl, StatusTellsOfADamagedState) {
  writeFile(world_.folder() / "kernel.db", std::string(8192, 'x'));
  const ProcessResult result = run({"status"});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, StartsWith("knobctl: kernel not usable: "));
  EXPECT_THAT(result.err, HasSubstr("kernel.db"));
  EXPECT_EQ(out({"boot", "--force"}), "");
  EXPECT_THAT(out({"status"}), HasSubstr("usable"));
}

TEST_F(Knobctl, StatusRefusesAKernelOfAnotherInterface) {
  changeState("UPDATE kernel SET md5 = 'another'");
  const ProcessResult result = run({"status"});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, StartsWith("knobctl: the kernel was started by a libknob of another "
                                     "interface; unload the pools with that version, or "));
  EXPECT_THAT(result.out, HasSubstr("kernel's signature        another"));
}

TEST_F(Knobctl, StatusAcceptsAKernelOfAnotherBuildDate) {
  changeState("UPDATE kernel SET build_date = 'Jan  1 2001 01:02:03'");
  const std::string text = out({"status"});
  EXPECT_THAT(text, HasSubstr(", built Jan  1 2001 01:02:03\n"));
  EXPECT_THAT(text, HasSubstr("condition                 usable\n"));
}

TEST_F(Knobctl, CheckMendsWhatItFinds) {
  EXPECT_EQ(out({"create", "host/opt/a"}), "");
  EXPECT_EQ(out({"check"}), "nothing is wrong\n");
  changeState("UPDATE groups SET mem_children = 99 WHERE name = 'opt'");
  const ProcessResult found = run({"check"});
  EXPECT_EQ(found.status, 1);
  EXPECT_THAT(found.out, HasSubstr("host/opt: "));
  EXPECT_THAT(found.out, Not(HasSubstr("(repaired)")));
  EXPECT_THAT(out({"check", "--repair"}), HasSubstr("(repaired)\n"));
  EXPECT_EQ(out({"check"}), "nothing is wrong\n");
}

TEST_F(Knobctl, AWrongLineIsAUsageError) {
  EXPECT_EQ(err(2, {}), "knobctl: a sub-command is required\nTry 'knobctl --help'.\n");
  EXPECT_THAT(err(2, {"grow"}), HasSubstr("grow"));
  EXPECT_THAT(err(2, {"create"}), HasSubstr("PATH is required"));
  EXPECT_THAT(err(2, {"join", "host"}), HasSubstr("PID is required"));
  for (const char *pid : {"0", "x", "1x", "", "1.5", "99999999999999999999"}) {
    EXPECT_THAT(err(2, {"join", "host/opt", pid}), HasSubstr("PID")) << pid;
  }
  EXPECT_THAT(err(2, {"facts", "host"}), HasSubstr("host"));
}

TEST_F(Knobctl, EveryCommandHasHelpOnStandardOutput) {
  for (const char *command :
       {"boot", "status", "tree", "stats", "facts", "check", "create", "set", "delete", "join"}) {
    EXPECT_THAT(out({"--help"}), HasSubstr(command));
    EXPECT_THAT(out({command, "--help"}), HasSubstr(std::string("knobctl ") + command));
  }
}

TEST_F(Knobctl, OutputThatCannotBeWrittenIsAFailure) {
  const int full = open("/dev/full", O_WRONLY | O_CLOEXEC);
  ASSERT_GE(full, 0);
  const pid_t child = fork();
  if (child == 0) {
    const std::string program = (::Test::binFolder() / "knobctl").string();
    setenv("KNOB_CONF", world_.environment.at("KNOB_CONF").c_str(), 1);
    dup2(full, 1);
    const int null = open("/dev/null", O_WRONLY | O_CLOEXEC);
    dup2(null, 2);
    execl(program.c_str(), program.c_str(), "facts", nullptr);
    _exit(127);
  }
  close(full);
  int status = 0;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_EQ(WEXITSTATUS(status), 1);
}

TEST_F(Knobctl, ALinuxKernelIsNotBootedByATool) {
  configure("kernel = linux\n");
  EXPECT_THAT(err(1, {"boot"}), HasSubstr("not supported"));
}

}  // namespace
