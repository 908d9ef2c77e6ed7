// SPDX-License-Identifier: Apache-2.0
// The emulated kernel's state: how it comes to be, what may be wrong with it, and what a boot does.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <iostream>

#include "common/sqlite.h"
#include "knob/emulated/boot.h"
#include "knob/emulated/emulated_kernel.h"
#include "knob/emulated/state_file.h"
#include "knob/machine_facts.h"
#include "knob/signature.h"
#include "temp_folder.h"

namespace Knob {
namespace {

using testing::HasSubstr;

struct Refusal {
  Status status;
  std::string reason;
};

Refusal refusalOf(const std::function<void()> &call) {
  try {
    call();
  } catch (const KernelError &error) {
    return {error.status, error.what()};
  }
  return {Status::kSuccess, ""};
}

// Makes the process another user's for a while.
class AsNobody {
 public:
  AsNobody() {
    EXPECT_EQ(::setegid(kNobody), 0);
    EXPECT_EQ(::seteuid(kNobody), 0);
  }
  AsNobody(const AsNobody &) = delete;
  AsNobody &operator=(const AsNobody &) = delete;
  ~AsNobody() {
    EXPECT_EQ(::seteuid(0), 0);
    EXPECT_EQ(::setegid(0), 0);
  }

 private:
  static constexpr uid_t kNobody = 65534;
};

class State : public testing::Test {
 protected:
  State() { configuration_.statePath = path_; }

  std::unique_ptr<Kernel> open() { return openEmulatedKernel(configuration_); }
  std::string notUsable() {
    const Refusal refusal = refusalOf([this] { (void)open(); });
    EXPECT_EQ(refusal.status, Status::kKernelNotUsable);
    return refusal.reason;
  }
  void boot(const BootFacts &facts, bool force) {
    bootEmulatedKernel(configuration_, facts, force);
  }
  void execute(const char *sql) {
    Platform::Database(path_, Platform::Database::Mode::kReadWrite, 1000).execute(sql);
  }
  static void setMin(Kernel &kernel, GroupId id, int64_t min) {
    AllocationChange change;
    change.min = min;
    kernel.setAllocation(id, Resource::kMemory, change);
  }

  const ::Test::TempFolder folder_;
  const std::string path_ = folder_.path() / "kernel.db";
  Configuration configuration_;
};

TEST_F(State, TheFirstUseBootsWithThisMachinesFacts) {
  const HostFacts facts = open()->facts();
  const HostFacts machine = readMachineFacts();
  EXPECT_EQ(facts.cpus, machine.cpus);
  EXPECT_EQ(facts.isVm, machine.isVm);
  EXPECT_EQ(facts.memoryKB, machine.memoryKB);
  EXPECT_EQ(facts.bootCommandLine, machine.bootCommandLine);
  EXPECT_GT(facts.cpus, 0U);
  EXPECT_GT(facts.memoryKB, 1024U);
}

// Uses a kernel for the first time on a disk of that size, in a process of its own. Returns what is
// wrong: empty when the use succeeded, or failed and left nothing behind.
std::string firstUseOnDisk(const std::string &folder, size_t bytes, bool *succeeded) {
  if (::unshare(CLONE_NEWNS) != 0) return "unshare";
  if (::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0) return "private";
  const std::string size = "size=" + std::to_string(bytes);
  if (::mount("tmpfs", folder.c_str(), "tmpfs", 0, size.c_str()) != 0) return "mount";
  Configuration configuration;
  configuration.statePath = folder + "/kernel.db";
  try {
    (void)openEmulatedKernel(configuration);
    *succeeded = true;
  } catch (const KernelError &error) {
    if (error.status != Status::kKernelNotUsable) return "status: " + std::string(error.what());
    const std::filesystem::directory_iterator files(folder);
    return files == end(files) ? "" : "left " + files->path().string();
  }
  const auto findings = openEmulatedKernel(configuration)->check(false);
  return findings.empty() ? "" : findings.front().text;
}

TEST_F(State, AFirstUseOnAFullDiskLeavesNothingBehind) {
  if (::geteuid() != 0) GTEST_SKIP() << "not root";
  constexpr int kSuccess = 0, kFailure = 1, kWrong = 2;
  constexpr size_t kPage = 4096;
  int failures = 0, successes = 0;
  for (size_t pages = 1; successes < 10; ++pages) {
    ASSERT_LT(pages, 200U);
    const pid_t child = ::fork();
    if (child == 0) {
      bool succeeded = false;
      const std::string wrong = firstUseOnDisk(folder_.path(), pages * kPage, &succeeded);
      if (!wrong.empty()) std::cerr << pages << " pages: " << wrong << '\n';
      ::_exit(!wrong.empty() ? kWrong : succeeded ? kSuccess : kFailure);
    }
    int status = 0;
    ASSERT_EQ(::waitpid(child, &status, 0), child);
    ASSERT_TRUE(WIFEXITED(status));
    ASSERT_NE(WEXITSTATUS(status), kWrong);
    ++(WEXITSTATUS(status) == kSuccess ? successes : failures);
  }
  EXPECT_GT(failures, 5);
}

TEST_F(State, AStateThatAnotherProcessHoldsNamesIt) {
  (void)open();
  std::array<int, 2> ready{};
  ASSERT_EQ(::pipe(ready.data()), 0);
  const pid_t holder = ::fork();
  if (holder == 0) {
    Platform::Database database(path_, Platform::Database::Mode::kReadWrite, 0);
    database.execute("BEGIN IMMEDIATE");
    (void)!::write(ready[1], "x", 1);
    for (;;) ::pause();
  }
  char byte = 0;
  EXPECT_EQ(::read(ready[0], &byte, 1), 1);
  const Refusal refusal =
      refusalOf([&] { throwStateError(path_, Platform::SqliteError(SQLITE_BUSY, "busy")); });
  EXPECT_EQ(refusal.status, Status::kFailure);
  EXPECT_EQ(refusal.reason, path_ + ": locked by process " + std::to_string(holder) +
                                " (knob_test) for more than 20 seconds");
  (void)::kill(holder, SIGKILL);
  (void)::waitpid(holder, nullptr, 0);
  for (const int end : ready) (void)::close(end);
}

TEST_F(State, MaxVmsIsTheConfigurationsUnlessTheBootHadOneOfItsOwn) {
  configuration_.maxVms = 5;
  EXPECT_EQ(open()->facts().maxVms, 5U);
  BootFacts facts;
  facts.maxVms = 6;
  boot(facts, false);
  EXPECT_EQ(open()->facts().maxVms, 6U);
}

TEST_F(State, TheSignatureIsThatOfTheLibraryThatBooted) {
  EXPECT_EQ(open()->signature().md5, buildSignature().md5);
  EXPECT_EQ(open()->signature().buildDate, buildDate());
  EXPECT_EQ(buildSignature().md5.size(), 32U);
  EXPECT_EQ(std::string(buildDate()).size(), 20U);
}

TEST_F(State, NothingIsLeftBesideItWhenAllHaveClosedIt) {
  { (void)open(); }
  size_t files = 0;
  for (const auto &entry : std::filesystem::directory_iterator(folder_.path())) {
    EXPECT_EQ(entry.path().filename().string().substr(0, 9), "kernel.db");
    EXPECT_EQ(entry.path().string().find(".boot"), std::string::npos);
    ++files;
  }
  EXPECT_LE(files, 4U);
}

TEST_F(State, AnEmptyFileIsNoStateYet) {
  ::Test::writeFile(path_, "");
  EXPECT_GT(open()->lookUp("host/opt"), 0);
}

TEST_F(State, WhatABootThatWasKilledLeftIsNoHindrance) {
  ::Test::writeFile(path_ + ".boot", "half a state");
  ::Test::writeFile(path_ + ".boot-wal", "and its log");
  ::Test::writeFile(path_ + "-wal", "of a state that was removed");
  EXPECT_GT(open()->lookUp("host/opt"), 0);
}

TEST_F(State, ProcessesThatStartTogetherBootOneKernel) {
  std::vector<pid_t> pids;
  for (int i = 0; i < 6; ++i) {
    const pid_t pid = ::fork();
    if (pid == 0) {
      try {
        open()->create(2, "pool" + std::to_string(i));
        ::_exit(0);
      } catch (...) {
        ::_exit(1);
      }
    }
    pids.push_back(pid);
  }
  for (const pid_t pid : pids) {
    int status = -1;
    ::waitpid(pid, &status, 0);
    EXPECT_EQ(status, 0);
  }
  EXPECT_EQ(open()->childGroups(2).size(), 6U);
}

TEST_F(State, AFolderThatDoesNotExistIsAReason) {
  const std::string folder = folder_.path() / "none";
  configuration_.statePath = folder + "/kernel.db";
  EXPECT_THAT(notUsable(), HasSubstr(folder + ": cannot open the folder"));
}

TEST_F(State, AFolderInItsPlaceIsAReason) {
  std::filesystem::create_directory(path_);
  EXPECT_THAT(notUsable(), HasSubstr("is not a regular file"));
}

TEST_F(State, APathThroughAFileIsAReason) {
  ::Test::writeFile(path_, "x");
  configuration_.statePath = path_ + "/kernel.db";
  EXPECT_THAT(notUsable(), HasSubstr("Not a directory"));
}

TEST_F(State, AFileThatIsNoDatabaseIsAReason) {
  ::Test::writeFile(path_, std::string(5000, 'z'));
  EXPECT_THAT(notUsable(), HasSubstr(path_ + ": cannot use the state: file is not a database"));
}

TEST_F(State, ADatabaseOfSomethingElseIsAReason) {
  Platform::Database(path_, Platform::Database::Mode::kCreate, 0).execute("CREATE TABLE t (i)");
  EXPECT_THAT(notUsable(), HasSubstr("is not a state of a kernel"));
}

TEST_F(State, AnotherVersionIsAReason) {
  { (void)open(); }
  execute("UPDATE kernel SET version = 99");
  EXPECT_THAT(notUsable(), HasSubstr("is a state of version 99, this library has 1"));
}

TEST_F(State, AStateWithoutItsKernelIsAReason) {
  { (void)open(); }
  execute("DELETE FROM kernel");
  EXPECT_THAT(notUsable(), HasSubstr("is damaged"));
}

TEST_F(State, ATruncatedFileIsNeverACrash) {
  {
    const auto kernel = open();
    for (int i = 0; i < 200; ++i) kernel->create(2, "pool" + std::to_string(i));
  }
  for (auto size = static_cast<int64_t>(std::filesystem::file_size(path_)) - 512; size > 0;
       size -= 1536) {
    ASSERT_EQ(::truncate(path_.c_str(), size), 0);
    const Refusal refusal = refusalOf([this] {
      const auto kernel = open();
      for (int i = 0; i < 200; i += 7) (void)kernel->lookUp("host/opt/pool" + std::to_string(i));
      (void)kernel->check(false);
    });
    EXPECT_TRUE(refusal.status == Status::kKernelNotUsable || refusal.status == Status::kNotFound ||
                refusal.status == Status::kSuccess)
        << refusal.reason;
  }
}

TEST_F(State, DamageInTheMiddleIsAReasonOrAFindingButNeverACrash) {
  {
    const auto kernel = open();
    for (int i = 0; i < 200; ++i) kernel->create(2, "pool" + std::to_string(i));
  }
  std::string bytes = ::Test::readFile(path_);
  for (size_t at = 1024; at < bytes.size(); at += 1024) {
    for (size_t i = 0; i < 300; ++i) bytes[at + i] = static_cast<char>(0xa5 ^ i);
  }
  ::Test::writeFile(path_, bytes);
  const Refusal refusal = refusalOf([this] { (void)open()->lookUp("host/opt/pool7"); });
  EXPECT_EQ(refusal.status, Status::kKernelNotUsable) << refusal.reason;
}

TEST_F(State, ADamagedOneIsReplacedByABootWithForceOnly) {
  ::Test::writeFile(path_, std::string(5000, 'z'));
  EXPECT_EQ(refusalOf([this] { boot({}, false); }).status, Status::kKernelNotUsable);
  boot({}, true);
  EXPECT_GT(open()->create(2, "pool"), 1000) << "ids of the lost state are not given again";
}

TEST_F(State, ABootTakesTheFactsThatItIsGiven) {
  BootFacts facts;
  facts.cpus = 7;
  facts.memoryMB = 1000;
  facts.maxVms = 3;
  facts.isVm = !readMachineFacts().isVm;
  facts.commandLine = "some words";
  boot(facts, false);
  const HostFacts booted = open()->facts();
  EXPECT_EQ(booted.cpus, 7U);
  EXPECT_EQ(booted.memoryKB, 1024000U);
  EXPECT_EQ(booted.maxVms, 3U);
  EXPECT_EQ(booted.isVm, *facts.isVm);
  EXPECT_EQ(booted.bootCommandLine, "some words");
}

TEST_F(State, ABootRefusesFactsOfNoMachine) {
  BootFacts facts;
  facts.cpus = 0;
  EXPECT_EQ(refusalOf([&] { boot(facts, true); }).status, Status::kBadParameter);
  facts = {};
  facts.memoryMB = 0;
  EXPECT_EQ(refusalOf([&] { boot(facts, true); }).status, Status::kBadParameter);
  facts.memoryMB = UINT64_MAX;
  EXPECT_EQ(refusalOf([&] { boot(facts, true); }).status, Status::kBadParameter);
  facts = {};
  facts.commandLine = std::string(4096, 'c');
  EXPECT_EQ(refusalOf([&] { boot(facts, true); }).status, Status::kBadParameter);
  EXPECT_FALSE(std::filesystem::exists(path_));
}

TEST_F(State, AMachineOf2To63KilobytesKeepsItsMemory) {
  BootFacts facts;
  facts.memoryMB = uint64_t{1} << 53;
  boot(facts, false);
  const auto kernel = open();
  EXPECT_EQ(kernel->facts().memoryKB, uint64_t{1} << 63);
  setMin(*kernel, 2, int64_t{1} << 53);
  EXPECT_EQ(kernel->memoryStatistics(2).ownReservedPeakKB, uint64_t{1} << 63);
  EXPECT_TRUE(kernel->check(false).empty());
}

TEST_F(State, ABootOfAKernelWithGroupsNeedsForce) {
  GroupId pool = 0;
  {
    const auto kernel = open();
    pool = kernel->create(2, "pool");
    setMin(*kernel, 2, 1);
  }
  const Refusal refusal = refusalOf([this] { boot({}, false); });
  EXPECT_EQ(refusal.status, Status::kBusy);
  EXPECT_THAT(refusal.reason, HasSubstr("1 groups"));
  EXPECT_EQ(open()->lookUp("host/opt/pool"), pool);
  boot({}, true);
  EXPECT_EQ(refusalOf([this] { (void)open()->lookUp("host/opt/pool"); }).status, Status::kNotFound);
  EXPECT_EQ(open()->readAllocation(2, Resource::kMemory).min, 0);
  EXPECT_EQ(open()->memoryStatistics(2).ownReservedPeakKB, 0U);
}

TEST_F(State, ABootOfAKernelWithoutGroupsNeedsNoForce) {
  { (void)open(); }
  boot({}, false);
  EXPECT_EQ(open()->childGroups(2).size(), 0U);
}

TEST_F(State, AnOpenKernelSeesTheBootOfAnother) {
  const auto kernel = open();
  kernel->create(2, "pool");
  boot({}, true);
  EXPECT_TRUE(kernel->childGroups(2).empty());
}

TEST_F(State, AUserWithoutRightsIsToldSo) {
  if (::geteuid() != 0) GTEST_SKIP() << "needs root to become another user";
  { (void)open(); }
  ASSERT_EQ(::chmod(folder_.path().c_str(), 0755), 0);
  {
    const AsNobody user;
    const Status status = refusalOf([this] { open()->create(2, "pool"); }).status;
    EXPECT_TRUE(status == Status::kKernelNotUsable || status == Status::kPermissionDenied);
  }
  EXPECT_TRUE(open()->childGroups(2).empty());
}

class Check : public State {
 protected:
  Check() {
    const auto kernel = open();
    parent_ = kernel->create(2, "parent");
    child_ = kernel->create(parent_, "child");
    setMin(*kernel, child_, 10);
  }

  // What the check finds after the state was changed behind the kernel's back: exactly this, first
  // as it is, then repaired, then no more.
  void expectFound(const char *sql, const std::string &path, const std::string &text) {
    execute(sql);
    for (const bool repair : {false, true}) {
      const auto findings = open()->check(repair);
      ASSERT_FALSE(findings.empty());
      EXPECT_EQ(findings.front().path, path);
      EXPECT_THAT(findings.front().text, HasSubstr(text));
      EXPECT_EQ(findings.front().repaired, repair);
    }
    EXPECT_TRUE(open()->check(false).empty());
  }

  GroupId parent_ = 0, child_ = 0;
};

TEST_F(Check, AGoodStateHasNoFindings) {
  EXPECT_TRUE(open()->check(true).empty());
}

TEST_F(Check, ASumThatIsTooLargeIsFoundAndMended) {
  expectFound("UPDATE groups SET mem_children = 50, children_peak_kb = 51200 WHERE name = 'parent'",
              "host/opt/parent", "the children reserve 10 of memory, the group counts 50");
}

TEST_F(Check, ASumThatIsTooSmallIsFoundAndMended) {
  expectFound("UPDATE groups SET cpu_children = -5 WHERE name = 'opt'", "host/opt",
              "the children reserve 0 of CPU, the group counts -5");
}

TEST_F(Check, AMendedSumChangesThoseAboveIt) {
  execute("UPDATE groups SET mem_min = 30, own_peak_kb = 30720 WHERE name = 'child'");
  EXPECT_EQ(open()->check(true).size(), 6U) << "three sums, and three peaks below them";
  EXPECT_TRUE(open()->check(false).empty());
  EXPECT_EQ(open()->view(1).memoryReservationMB, 30);
}

TEST_F(Check, APeakBelowWhatIsReservedIsFoundAndMended) {
  expectFound("UPDATE groups SET own_peak_kb = 5 WHERE name = 'child'", "host/opt/parent/child",
              "a peak is below");
}

TEST_F(Check, AGroupThatHostDoesNotReachIsFoundAndRemoved) {
  expectFound("INSERT INTO groups (parent, name) VALUES (999, 'lost')", "lost",
              "has no way up to host");
}

TEST_F(Check, AMemberOfNoGroupIsFoundAndRemoved) {
  expectFound("INSERT INTO members VALUES (1, 1, 999)", path_, "process 1 is in no group");
}

TEST_F(Check, ABrokenFileIsFoundAndNotMended) {
  {
    const auto kernel = open();
    for (int i = 0; i < 100; ++i) kernel->create(parent_, "pool" + std::to_string(i));
  }
  execute("PRAGMA writable_schema = ON; DELETE FROM sqlite_schema WHERE name = 'members_by_group'");
  const auto findings = open()->check(true);
  ASSERT_EQ(findings.size(), 1U);
  EXPECT_THAT(findings.front().text, HasSubstr("the state is damaged"));
  EXPECT_FALSE(findings.front().repaired);
}

TEST_F(Check, AViewHoldsWhatPeopleAreShown) {
  const GroupView view = open()->view(child_);
  EXPECT_EQ(view.id, child_);
  EXPECT_EQ(view.name, "child");
  EXPECT_EQ(view.memory.min, 10);
  EXPECT_EQ(view.memoryReservationMB, 10);
  EXPECT_EQ(view.cpuReservationPercent, 0);
  EXPECT_EQ(view.usage.memoryBytes, 0U);
  EXPECT_FALSE(view.usage.cpuMicroseconds);
  EXPECT_EQ(view.deviation, "");
  EXPECT_EQ(refusalOf([this] { (void)open()->view(999); }).status, Status::kNotFound);
}

TEST_F(Check, AViewCountsTheMemoryOfProcessesBelow) {
  const auto kernel = open();
  kernel->join(child_, ::getpid());
  EXPECT_EQ(kernel->members(child_), std::vector<int64_t>{::getpid()});
  EXPECT_GT(*kernel->view(1).usage.memoryBytes, 500000U);
}

class DefaultPlace : public testing::Test {
 protected:
  // The place that a user has, after what the case prepares as that user; or why there is none.
  std::string placeOfNobody(const std::function<void()> &prepare) {
    ::umask(022);
    ::unsetenv("XDG_RUNTIME_DIR");
    ::setenv("TMPDIR", folder_.path().c_str(), 1);
    const AsNobody user;
    prepare();
    std::string place;
    const Refusal refusal = refusalOf([&] { place = defaultStatePath(); });
    return refusal.status == Status::kSuccess ? place : refusal.reason;
  }
  void SetUp() override {
    if (::geteuid() != 0) GTEST_SKIP() << "needs root to become another user";
    ASSERT_EQ(::chmod(folder_.path().c_str(), 01777), 0);
  }
  void TearDown() override {
    if (temporary_.empty()) {
      ::unsetenv("TMPDIR");
    } else {
      ::setenv("TMPDIR", temporary_.c_str(), 1);
    }
  }
  std::string own() const { return folder_.path() / "knob-65534"; }

  const std::string temporary_ = ::getenv("TMPDIR") != nullptr ? ::getenv("TMPDIR") : "";
  const ::Test::TempFolder folder_;
};

TEST_F(DefaultPlace, AUserHasAPrivateFolderBelowTheTempFolder) {
  EXPECT_EQ(placeOfNobody([] {}), own() + "/kernel.db");
  EXPECT_EQ(placeOfNobody([] {}), own() + "/kernel.db") << "it is there already";
  EXPECT_EQ(std::filesystem::status(own()).permissions(), std::filesystem::perms::owner_all);
}

TEST_F(DefaultPlace, TheRuntimeFolderComesFirst) {
  const std::string runtime = folder_.path() / "runtime";
  EXPECT_EQ(placeOfNobody([&] {
              std::filesystem::create_directory(runtime);
              ::setenv("XDG_RUNTIME_DIR", runtime.c_str(), 1);
            }),
            runtime + "/knob/kernel.db");
}

TEST_F(DefaultPlace, AFolderOfSomebodyElseIsRefused) {
  std::filesystem::create_directory(own());
  EXPECT_EQ(placeOfNobody([] {}), own() + ": belongs to another user");
}

TEST_F(DefaultPlace, AFolderThatIsOpenToOthersIsRefused) {
  EXPECT_THAT(placeOfNobody([&] {
                std::filesystem::create_directory(own());
                ::chmod(own().c_str(), 0770);
              }),
              HasSubstr(own() + ": other users have rights on it"));
}

TEST_F(DefaultPlace, ALinkIsRefused) {
  EXPECT_EQ(placeOfNobody([&] { std::filesystem::create_symlink("/", own()); }),
            own() + ": is not a folder");
}

TEST_F(DefaultPlace, ATempFolderThatCannotBeWrittenIsAReason) {
  ASSERT_EQ(::chmod(folder_.path().c_str(), 0755), 0);
  EXPECT_EQ(placeOfNobody([] {}), own() + ": cannot make the folder: Permission denied");
}

}  // namespace
}  // namespace Knob
