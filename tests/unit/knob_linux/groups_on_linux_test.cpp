// SPDX-License-Identifier: Apache-2.0
// What only a real kernel shows: groups that another program made, records and files that were
// changed from outside, rights, other folders for the tree. Runs as root of a machine of its own.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <linux/capability.h>
#include <sys/file.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <functional>
#include <sstream>
#include <system_error>

#include "interrupted_calls.h"
#include "knob/linux/cgroup_tree.h"
#include "knob/linux/fixed_groups.h"
#include "knob/linux/linux_kernel.h"
#include "knob/linux/oom_score.h"
#include "knob/linux/record.h"
#include "knob/linux/tree_lock.h"
#include "knob/signature.h"
#include "knob/status.h"

namespace Knob::Linux {
namespace {

using std::filesystem::path;
using testing::HasSubstr;

const path kMount = "/sys/fs/cgroup";

std::string fileText(const path &group, const std::string &name) {
  std::ifstream file(kMount / group / name);
  std::stringstream text;
  text << file.rdbuf();
  std::string all = text.str();
  while (!all.empty() && all.back() == '\n') all.pop_back();
  return all;
}

void write(const path &group, const std::string &name, const std::string &text) {
  const int file = ::open((kMount / group / name).c_str(), O_WRONLY | O_CLOEXEC);
  const ssize_t count = file < 0 ? -1 : ::write(file, text.data(), text.size());
  const int error = errno;
  if (file >= 0) ::close(file);
  if (count < 0) throw std::system_error(error, std::generic_category(), (group / name).string());
}

void removeTree(const path &group) {
  if (!std::filesystem::exists(kMount / group)) return;
  write(group, "cgroup.kill", "1");
  for (const auto &entry : std::filesystem::directory_iterator(kMount / group)) {
    if (entry.is_directory()) removeTree(group / entry.path().filename());
  }
  while (::rmdir((kMount / group).c_str()) != 0) {
    if (errno != EBUSY) throw std::system_error(errno, std::generic_category(), group.string());
    ::usleep(1000);
  }
}

std::string attribute(const path &group, const char *name) {
  char value[256];
  const ssize_t size = ::getxattr((kMount / group).c_str(), name, value, sizeof(value));
  return size < 0 ? "" : std::string(value, static_cast<size_t>(size));
}

void setAttribute(const path &group, const char *name, const std::string &value) {
  ASSERT_EQ(::setxattr((kMount / group).c_str(), name, value.data(), value.size(), 0), 0);
}

// A process in a group until the end of the test. memoryMB: taken in the group.
class Member {
 public:
  explicit Member(const path &group, size_t memoryMB = 0) {
    int ready[2];
    if (::pipe(ready) != 0 || (pid_ = ::fork()) < 0) throw std::runtime_error("no process");
    if (pid_ == 0) {
      write(group, "cgroup.procs", "0");
      std::string memory(memoryMB << 20, 'x');
      if (::write(ready[1], memory.c_str(), 1) != 1) ::_exit(1);
      for (;;) ::pause();
    }
    ::close(ready[1]);
    char byte = 0;
    if (::read(ready[0], &byte, 1) != 1) throw std::runtime_error("no process");
    ::close(ready[0]);
  }
  ~Member() {
    ::kill(pid_, SIGKILL);
    ::waitpid(pid_, nullptr, 0);
  }
  pid_t pid() const { return pid_; }
  Member(const Member &) = delete;
  Member &operator=(const Member &) = delete;

 private:
  pid_t pid_ = -1;
};

class OnLinux : public testing::Test {
 protected:
  OnLinux() {
    if (::getenv("UML_MACHINE") == nullptr) return;
    for (const char *group : {"host", "theirs"}) removeTree(group);
    configuration_.kernel = Configuration::KernelKind::kLinux;
  }
  void SetUp() override {
    if (::getenv("UML_MACHINE") == nullptr) GTEST_SKIP() << "runs only in a machine of its own";
    kernel_ = open();
  }
  ~OnLinux() override {
    if (::getenv("UML_MACHINE") == nullptr) return;
    kernel_.reset();
    for (const char *group : {"host", "theirs"}) removeTree(group);
  }

  std::unique_ptr<Kernel> open() { return openLinuxKernel(configuration_); }
  GroupId create(const std::string &parent, const std::string &name) {
    return kernel_->create(kernel_->lookUp(parent), name);
  }
  void setMemory(GroupId id, int64_t min, int64_t max) {
    AllocationChange change;
    change.min = min;
    change.max = max;
    kernel_->setAllocation(id, Resource::kMemory, change);
  }
  void setCpu(GroupId id, int64_t max, int64_t shares) {
    AllocationChange change;
    change.max = max;
    change.shares = shares;
    kernel_->setAllocation(id, Resource::kCpu, change);
  }
  static void setCpuMinOf(Kernel &kernel, GroupId id, int64_t min) {
    AllocationChange change;
    change.min = min;
    kernel.setAllocation(id, Resource::kCpu, change);
  }
  void setCpuMin(GroupId id, int64_t min) { setCpuMinOf(*kernel_, id, min); }
  std::vector<std::string> check(bool repair) {
    std::vector<std::string> lines;
    for (const Finding &finding : kernel_->check(repair)) {
      lines.push_back(finding.path + ": " + finding.text + (finding.repaired ? " (repaired)" : ""));
    }
    return lines;
  }

  Configuration configuration_;
  std::unique_ptr<Kernel> kernel_;
};

Status statusOfCall(const std::function<void()> &call, std::string *text = nullptr) {
  try {
    call();
    return Status::kSuccess;
  } catch (const KernelError &error) {
    if (text != nullptr) *text = error.what();
    return error.status;
  }
}

// ---- foreign groups, made by another program

TEST_F(OnLinux, AForeignGroupIsReadFromItsFilesAndLeftAlone) {
  create("host/opt", "ours");
  ASSERT_EQ(::mkdir((kMount / "host/opt/other").c_str(), 0755), 0);
  write("host/opt/other", "memory.min", "5242880");
  write("host/opt/other", "memory.max", "104857600");
  write("host/opt/other", "cpu.max", "25000 50000");
  write("host/opt/other", "cpu.weight", "200");
  const GroupId id = kernel_->lookUp("host/opt/other");
  const Allocation memory = kernel_->readAllocation(id, Resource::kMemory);
  EXPECT_EQ(memory.min, 5);
  EXPECT_EQ(memory.max, 100);
  EXPECT_EQ(memory.minLimit, -1);
  const Allocation cpu = kernel_->readAllocation(id, Resource::kCpu);
  EXPECT_EQ(cpu.max, 50);
  EXPECT_EQ(cpu.shares, -4);
  EXPECT_TRUE(kernel_->view(id).deviation.empty());
  EXPECT_TRUE(check(true).empty());
  EXPECT_EQ(attribute("host/opt/other", kRecordAttribute), "");
  EXPECT_EQ(fileText("host", "memory.min"), "0");
}

TEST_F(OnLinux, ASettingMakesTheMinimumOfAForeignGroupAReservation) {
  create("host/opt", "ours");
  ASSERT_EQ(::mkdir((kMount / "host/opt/other").c_str(), 0755), 0);
  write("host/opt/other", "memory.min", "5242880");
  setCpuMin(kernel_->lookUp("host/opt/other"), 3);
  EXPECT_EQ(fileText("host/opt", "memory.min"), "5242880");
  EXPECT_EQ(fileText("host", "memory.min"), "5242880");
  EXPECT_EQ(fileText("host/opt/other", "memory.min"), "5242880");
  EXPECT_TRUE(check(false).empty());
  kernel_->remove(kernel_->lookUp("host/opt/other"));
  EXPECT_EQ(fileText("host", "memory.min"), "0");
  EXPECT_TRUE(check(false).empty());
}

TEST_F(OnLinux, AReservationBelowAForeignGroupKeepsItsMinimum) {
  create("host/opt", "ours");
  ASSERT_EQ(::mkdir((kMount / "host/opt/other").c_str(), 0755), 0);
  write("host/opt/other", "memory.min", "5242880");
  const GroupId child = create("host/opt/other", "child");
  setMemory(child, 3, -1);
  EXPECT_EQ(fileText("host/opt/other", "memory.min"), "5242880");
  EXPECT_EQ(fileText("host", "memory.min"), "5242880");
  setMemory(child, 8, -1);
  EXPECT_EQ(fileText("host/opt/other", "memory.min"), "8388608");
  EXPECT_EQ(fileText("host", "memory.min"), "8388608");
  EXPECT_TRUE(check(false).empty());
}

// ---- records and files that were changed from outside

TEST_F(OnLinux, AFileThatDiffersFromTheRecordIsReportedAndRepaired) {
  const GroupId id = create("host/opt", "pool");
  setMemory(id, 10, 100);
  write("host/opt", "memory.min", "0");
  write("host/opt/pool", "memory.max", "max");
  write("host/opt/pool", "cpu.weight", "77");
  EXPECT_EQ(kernel_->view(id).deviation,
            "memory.max is max, not 104857600; cpu.weight is 77, not 100");
  EXPECT_THAT(check(false),
              testing::UnorderedElementsAre("host/opt/pool: memory.max is max, not 104857600",
                                            "host/opt/pool: cpu.weight is 77, not 100",
                                            "host/opt: memory.min is 0, not 10485760"));
  EXPECT_EQ(check(true).size(), 3U);
  EXPECT_TRUE(check(false).empty());
  EXPECT_EQ(fileText("host/opt", "memory.min"), "10485760");
  EXPECT_EQ(fileText("host/opt/pool", "memory.max"), "104857600");
}

TEST_F(OnLinux, AMaximumThatLivingProcessesExceedIsReportedNotForced) {
  const GroupId id = create("host/opt", "pool");
  setMemory(id, 0, 20);
  write("host/opt/pool", "memory.max", "max");
  const Member member("host/opt/pool", 50);
  const auto findings = kernel_->check(true);
  ASSERT_EQ(findings.size(), 1U);
  EXPECT_FALSE(findings[0].repaired);
  EXPECT_THAT(findings[0].text, HasSubstr("living processes use"));
  EXPECT_EQ(fileText("host/opt/pool", "memory.max"), "max");
  EXPECT_EQ(fileText("host/opt/pool", "memory.high"), "max");
  EXPECT_THAT(fileText("host/opt/pool", "memory.events"), HasSubstr("oom_kill 0"));
}

TEST_F(OnLinux, ADamagedRecordIsOverwrittenOnlyByRepair) {
  const GroupId id = create("host/opt", "pool");
  setMemory(id, 10, 100);
  setAttribute("host/opt/pool", kRecordAttribute, "nonsense");
  EXPECT_EQ(kernel_->readAllocation(id, Resource::kMemory).min, 10) << "its files still say so";
  EXPECT_EQ(statusOfCall([&] { setMemory(id, 20, 100); }), Status::kFailure);
  EXPECT_EQ(attribute("host/opt/pool", kRecordAttribute), "nonsense");
  EXPECT_EQ(fileText("host", "memory.min"), "10485760");
  EXPECT_FALSE(check(false).empty());
  EXPECT_FALSE(check(true).empty());
  EXPECT_TRUE(check(false).empty());
  setMemory(id, 20, 100);
  EXPECT_EQ(fileText("host", "memory.min"), "20971520");
}

TEST_F(OnLinux, WrongSumsAreReportedAndRepaired) {
  const GroupId id = create("host/opt", "pool");
  setMemory(id, 10, -1);
  setCpuMin(id, 20);
  Record record = *decode(attribute("host/opt", kRecordAttribute));
  record.memory.childrenSum = 99;
  record.cpu.childrenSum = 0;
  const RecordBytes bytes = encode(record);
  setAttribute("host/opt", kRecordAttribute, {bytes.data(), bytes.size()});
  const auto lines = check(true);
  EXPECT_THAT(
      lines, testing::Contains("host/opt: its children reserve 10 MB of memory, its record says 99 "
                               "(repaired)"));
  EXPECT_THAT(lines, testing::Contains("host/opt: its children reserve 20 percent of CPU, its "
                                       "record says 0 (repaired)"));
  EXPECT_TRUE(check(false).empty());
}

TEST_F(OnLinux, ARemovedRecordAboveReservationsIsWrittenAgain) {
  create("host/opt", "parent");
  setMemory(create("host/opt/parent", "child"), 10, -1);
  ASSERT_EQ(::removexattr((kMount / "host/opt/parent").c_str(), kRecordAttribute), 0);
  EXPECT_FALSE(check(false).empty());
  EXPECT_FALSE(check(true).empty());
  EXPECT_TRUE(check(false).empty());
  EXPECT_EQ(fileText("host", "memory.min"), "10485760");
}

TEST_F(OnLinux, AMemoryHighThatADeadProcessLoweredIsRestored) {
  const GroupId id = create("host/opt", "pool");
  setMemory(id, 1, 100);
  Record record = *decode(attribute("host/opt/pool", kRecordAttribute));
  record.savedHigh = uint64_t{64} << 20;
  const RecordBytes bytes = encode(record);
  for (const bool byRepair : {false, true}) {
    setAttribute("host/opt/pool", kRecordAttribute, {bytes.data(), bytes.size()});
    write("host/opt/pool", "memory.high", "1048576");
    if (byRepair) {
      EXPECT_EQ(check(true).size(), 1U);
    } else {
      setMemory(id, 2, 100);
    }
    EXPECT_EQ(fileText("host/opt/pool", "memory.high"), "67108864");
    EXPECT_FALSE(decode(attribute("host/opt/pool", kRecordAttribute))->savedHigh);
    setMemory(id, 1, 100);
  }
  EXPECT_TRUE(check(false).empty());
}

TEST_F(OnLinux, DisabledControllersAreReportedAndEnabledAgain) {
  const GroupId id = create("host/opt", "pool");
  setMemory(id, 10, 100);
  write("host/opt", "cgroup.subtree_control", "-memory");
  EXPECT_THAT(kernel_->view(id).deviation, HasSubstr("there is no memory.min"));
  EXPECT_FALSE(check(true).empty());
  EXPECT_TRUE(check(false).empty());
  EXPECT_EQ(fileText("host/opt/pool", "memory.max"), "104857600");
}

// ---- rights, and other folders

// Drops every capability of this thread's effective set.
void dropCapabilities() {
  __user_cap_header_struct header{_LINUX_CAPABILITY_VERSION_3, 0};
  __user_cap_data_struct none[2] = {};
  ASSERT_EQ(::syscall(SYS_capset, &header, none), 0);
}

// Runs in a process of its own, which may give up what it has.
void elsewhere(const std::function<void()> &work) {
  const pid_t pid = ::fork();
  if (pid == 0) {
    work();
    ::_exit(testing::Test::HasFailure() ? 1 : 0);
  }
  int status = -1;
  ::waitpid(pid, &status, 0);
  EXPECT_EQ(status, 0);
}

TEST_F(OnLinux, WithoutTheRightToOpenByIdGroupsAreStillFound) {
  create("host/opt", "a");
  const GroupId id = create("host/opt/a", "b");
  setMemory(id, 10, 100);
  const GroupId host = kernel_->lookUp("host");
  elsewhere([&] {
    dropCapabilities();
    const auto kernel = open();
    EXPECT_EQ(kernel->readAllocation(id, Resource::kMemory).min, 10);
    EXPECT_EQ(kernel->view(id).name, "b");
    EXPECT_EQ(kernel->childGroups(host).size(), 1U);
    EXPECT_EQ(statusOfCall([&] { kernel->view(id + 1000000); }), Status::kNotFound);
    EXPECT_EQ(statusOfCall([&] { kernel->view(1); }), Status::kNotFound);
    kernel->remove(id);
    EXPECT_EQ(statusOfCall([&] { kernel->view(id); }), Status::kNotFound);
  });
}

TEST_F(OnLinux, AnOrdinaryUserReadsButChangesNothing) {
  const GroupId id = create("host/opt", "pool");
  setMemory(id, 10, 100);
  elsewhere([&] {
    ASSERT_EQ(::setuid(12345), 0);
    const auto kernel = open();
    EXPECT_EQ(kernel->lookUp("host/opt/pool"), id);
    EXPECT_EQ(kernel->readAllocation(id, Resource::kMemory).min, 10);
    AllocationChange change;
    change.min = 20;
    EXPECT_EQ(statusOfCall([&] { kernel->setAllocation(id, Resource::kMemory, change); }),
              Status::kPermissionDenied);
    EXPECT_EQ(statusOfCall([&] { kernel->create(id, "below"); }), Status::kPermissionDenied);
    EXPECT_EQ(statusOfCall([&] { kernel->remove(id); }), Status::kPermissionDenied);
    EXPECT_TRUE(kernel->check(false).empty());
    EXPECT_THAT(lookAtLinuxHost(configuration_).problems,
                testing::ElementsAre(HasSubstr("no right to make or change groups")));
  });
  EXPECT_EQ(fileText("host", "memory.min"), "10485760");
  EXPECT_TRUE(check(false).empty());
}

TEST_F(OnLinux, AnOrdinaryUserCannotMakeTheFirstGroup) {
  elsewhere([&] {
    ASSERT_EQ(::setuid(12345), 0);
    std::string text;
    EXPECT_EQ(statusOfCall([&] { open()->lookUp("host"); }, &text), Status::kKernelNotUsable);
    EXPECT_THAT(text, HasSubstr("run as root, or set cgroup-root"));
  });
}

// Locks every file of a group that an ordinary user can open, until the end of the test.
class HostileUser {
 public:
  explicit HostileUser(const path &group) {
    int ready[2];
    if (::pipe(ready) != 0 || (pid_ = ::fork()) < 0) throw std::runtime_error("no process");
    if (pid_ == 0) {
      if (::setuid(12345) != 0) ::_exit(1);
      lock(kMount / group);
      for (const auto &entry : std::filesystem::directory_iterator(kMount / group)) {
        if (entry.is_regular_file()) lock(entry.path());
      }
      if (::write(ready[1], "x", 1) != 1) ::_exit(1);
      for (;;) ::pause();
    }
    ::close(ready[1]);
    char byte = 0;
    if (::read(ready[0], &byte, 1) != 1) throw std::runtime_error("no process");
    ::close(ready[0]);
  }
  ~HostileUser() {
    ::kill(pid_, SIGKILL);
    ::waitpid(pid_, nullptr, 0);
  }
  HostileUser(const HostileUser &) = delete;
  HostileUser &operator=(const HostileUser &) = delete;

 private:
  static void lock(const path &file) {
    for (const int mode : {O_RDONLY, O_WRONLY}) {
      const int descriptor = ::open(file.c_str(), mode);
      if (descriptor >= 0) (void)::flock(descriptor, LOCK_EX | LOCK_NB);
    }
  }

  pid_t pid_ = -1;
};

TEST_F(OnLinux, NoLockOfAnOrdinaryUserStopsAnOperation) {
  const GroupId id = create("host/opt", "pool");
  const HostileUser user("host");
  const auto begin = std::chrono::steady_clock::now();
  setMemory(id, 10, 100);
  EXPECT_EQ(kernel_->view(id).memory.min, 10);
  kernel_->remove(id);
  EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(5));
}

TEST_F(OnLinux, ALockOfRootIsRefusedAtTheDeadlineWithItsHolder) {
  const GroupId id = create("host/opt", "pool");
  const GroupPtr host = CgroupTree(openHierarchy(configuration_)).host();
  const TreeLock lock(host->fd(), TreeLock::Kind::kExclusive);
  std::string text;
  EXPECT_EQ(statusOfCall([&] { setMemory(id, 10, 100); }, &text), Status::kFailure);
  EXPECT_EQ(text, "the groups have been locked by process " + std::to_string(::getpid()) +
                      " (groups_on_linux) for 20 s");
}

class Elsewhere : public OnLinux {
 protected:
  void makeTheirs(const std::string &enabled) {
    write("", "cgroup.subtree_control", "+memory +cpu");
    ASSERT_EQ(::mkdir((kMount / "theirs").c_str(), 0755), 0);
    ASSERT_EQ(::mkdir((kMount / "theirs/ours").c_str(), 0755), 0);
    if (!enabled.empty()) write("theirs", "cgroup.subtree_control", enabled);
    configuration_.cgroupRoot = "/theirs/ours/";
  }
  std::string whyNot() {
    std::string text;
    EXPECT_EQ(statusOfCall([&] { open()->lookUp("host"); }, &text), Status::kKernelNotUsable);
    return text;
  }
};

TEST_F(Elsewhere, TheTreeIsInTheFolderThatTheConfigurationNames) {
  makeTheirs("+memory +cpu");
  kernel_ = open();
  setMemory(create("host/opt", "pool"), 10, -1);
  EXPECT_EQ(fileText("theirs/ours/host/opt/pool", "memory.min"), "10485760");
  EXPECT_EQ(fileText("theirs/ours", "memory.min"), "0") << "not ours to write";
  EXPECT_FALSE(std::filesystem::exists(kMount / "host"));
}

TEST_F(Elsewhere, APromiseThatTheGroupsAboveDoNotKeepIsReported) {
  makeTheirs("+memory +cpu");
  kernel_ = open();
  setMemory(create("host/opt", "pool"), 10, -1);
  const auto lines = check(true);
  ASSERT_EQ(lines.size(), 2U);
  EXPECT_THAT(lines[0], HasSubstr("memory.min of /sys/fs/cgroup/theirs/ours, which is not ours"));
  EXPECT_THAT(lines[1], HasSubstr("memory.min of /sys/fs/cgroup/theirs, which is not ours"));
  EXPECT_EQ(lookAtLinuxHost(configuration_).problems.size(), 2U);
  write("theirs", "memory.min", "10485760");
  write("theirs/ours", "memory.min", "20971520");
  EXPECT_TRUE(check(false).empty());
  EXPECT_TRUE(lookAtLinuxHost(configuration_).problems.empty());
}

TEST_F(Elsewhere, AMissingFolderIsReported) {
  configuration_.cgroupRoot = "theirs/none";
  EXPECT_THAT(whyNot(), HasSubstr("cgroup-root: /sys/fs/cgroup/theirs/none: No such file"));
}

TEST_F(Elsewhere, AFolderCannotLeadOut) {
  configuration_.cgroupRoot = "../../..";
  EXPECT_THAT(whyNot(), HasSubstr("cgroup-root"));
}

TEST_F(Elsewhere, ControllersThatAreNotEnabledAreReported) {
  makeTheirs("+cpu");
  EXPECT_THAT(whyNot(), HasSubstr("the memory controller is not enabled in "
                                  "/sys/fs/cgroup/theirs/ours; write +memory"));
}

TEST_F(Elsewhere, ProcessesInTheFolderAreReported) {
  makeTheirs("+memory +cpu");
  const Member member("theirs/ours");
  EXPECT_THAT(whyNot(), HasSubstr("processes are in /sys/fs/cgroup/theirs/ours itself"));
}

// Runs in a process with mounts of its own.
void withOwnMounts(const std::function<void()> &work) {
  elsewhere([&] {
    ASSERT_EQ(::unshare(CLONE_NEWNS), 0);
    ASSERT_EQ(::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr), 0);
    work();
  });
}

TEST_F(Elsewhere, AMissingMountIsReportedWithTheCommandForIt) {
  withOwnMounts([&] {
    ASSERT_EQ(::umount2(kMount.c_str(), MNT_DETACH), 0);
    EXPECT_THAT(whyNot(), HasSubstr("no cgroup2 file system is mounted"));
  });
}

TEST_F(Elsewhere, AReadOnlyMountIsReported) {
  withOwnMounts([&] {
    ASSERT_EQ(::mount(nullptr, kMount.c_str(), nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr),
              0);
    EXPECT_THAT(whyNot(), HasSubstr("is read-only; mount -o remount,rw /sys/fs/cgroup"));
  });
}

TEST_F(Elsewhere, AHiddenMountIsSkippedForOneThatIsNot) {
  withOwnMounts([&] {
    ASSERT_EQ(::mount("none", "/run", "tmpfs", 0, nullptr), 0);
    ASSERT_EQ(::mkdir("/run/my groups", 0755), 0);
    ASSERT_EQ(::mount("none", "/run/my groups", "cgroup2", 0, nullptr), 0);
    ASSERT_EQ(::mount("none", kMount.c_str(), "tmpfs", 0, nullptr), 0);
    EXPECT_EQ(lookAtLinuxHost(configuration_).path, "/run/my groups");
    EXPECT_EQ(statusOfCall([&] { open()->lookUp("host/opt"); }), Status::kSuccess);
  });
}

TEST_F(Elsewhere, MountsThatAreAllHiddenAreReported) {
  withOwnMounts([&] {
    ASSERT_EQ(::mount("none", kMount.c_str(), "tmpfs", 0, nullptr), 0);
    EXPECT_THAT(whyNot(), HasSubstr("hidden by another mount"));
  });
}

// ---- the library that made host

TEST_F(OnLinux, ARebuiltLibraryWithTheSameInterfaceUsesTheGroups) {
  create("host/opt", "pool");
  const std::string older = buildSignature().md5 + " Jan  1 2020 00:00:00";
  setAttribute("host", kLibraryAttribute, older);
  EXPECT_EQ(kernel_->signature().md5, buildSignature().md5);
  EXPECT_EQ(kernel_->signature().buildDate, "Jan  1 2020 00:00:00");
  EXPECT_TRUE(check(false).empty());
}

TEST_F(OnLinux, AnotherInterfaceNeedsRepairOrATreeWithoutPools) {
  const std::string other = std::string(32, 'f') + " Jan  1 2020 00:00:00";
  create("host/opt", "pool");
  setAttribute("host", kLibraryAttribute, other);
  EXPECT_EQ(kernel_->signature().md5, std::string(32, 'f'));
  EXPECT_FALSE(check(true).empty());
  EXPECT_EQ(kernel_->signature().md5, buildSignature().md5);

  setAttribute("host", kLibraryAttribute, other);
  kernel_->remove(kernel_->lookUp("host/opt/pool"));
  EXPECT_EQ(kernel_->signature().md5, buildSignature().md5);
  EXPECT_EQ(attribute("host", kLibraryAttribute).substr(0, 32), buildSignature().md5);
}

TEST_F(OnLinux, ReadingTheSignatureMakesNoGroup) {
  EXPECT_EQ(kernel_->signature().md5, buildSignature().md5);
  EXPECT_FALSE(std::filesystem::exists(kMount / "host"));
}

// ---- what the machine can promise

TEST_F(OnLinux, WhatAnotherSliceProtectsIsNotPromisedAgain) {
  configuration_.reserve = {20, 0};
  kernel_ = open();
  const GroupId id = create("host/opt", "pool");
  ASSERT_EQ(::mkdir((kMount / "theirs").c_str(), 0755), 0);
  write("theirs", "memory.min", "104857600");
  std::string text;
  EXPECT_EQ(statusOfCall([&] { setMemory(id, 150, -1); }, &text), Status::kReservationRefused);
  EXPECT_THAT(text, testing::MatchesRegex("150 MB asked for, [0-9]+ MB free on the machine: 20 MB "
                                          "for the system, 100 MB for /sys/fs/cgroup/theirs"));
  EXPECT_EQ(fileText("host", "memory.min"), "0");
}

TEST_F(OnLinux, WhatAnotherSliceProtectsLaterIsReportedAsOverPromised) {
  const GroupId id = create("host/opt", "pool");
  setMemory(id, 100, -1);
  ASSERT_EQ(::mkdir((kMount / "theirs").c_str(), 0755), 0);
  write("theirs", "memory.min", "104857600");
  const auto lines = [&] {
    kernel_ = open();
    return check(true);
  }();
  ASSERT_EQ(lines.size(), 1U);
  EXPECT_THAT(lines[0], HasSubstr("more is promised than the machine can give"));
  EXPECT_THAT(lines[0], HasSubstr("100 MB for /sys/fs/cgroup/theirs"));
  setMemory(id, 0, -1);
  EXPECT_TRUE(check(false).empty());
}

TEST_F(OnLinux, ARefusalNamesTheGroupWithoutRoomAndItsHolders) {
  const GroupId parent = create("host/opt", "parent");
  setMemory(parent, 0, 50);
  setMemory(create("host/opt/parent", "a"), 30, -1);
  std::string text;
  const GroupId b = create("host/opt/parent", "b");
  EXPECT_EQ(statusOfCall([&] { setMemory(b, 25, -1); }, &text), Status::kReservationRefused);
  EXPECT_EQ(text, "25 MB asked for, 20 MB free in host/opt/parent: 30 MB for host/opt/parent/a");
}

TEST_F(OnLinux, TheStatusHasTheWholeAccount) {
  configuration_.reserve = {20, 10};
  kernel_ = open();
  setMemory(create("host/opt", "pool"), 30, -1);
  const LinuxHost host = lookAtLinuxHost(configuration_);
  ASSERT_EQ(host.account.size(), 2U);
  EXPECT_THAT(host.account[0].second,
              testing::MatchesRegex("[0-9]+ MB: 20 MB for the system; [0-9]+ MB for groups, which "
                                    "reserve 30 MB"));
  EXPECT_EQ(host.account[1].second,
            "100 % of a CPU: 10 % of a CPU for the system; 90 % of a CPU "
            "for groups, which reserve 0 % of a CPU");
}

int remountWith(const char *option) {
  return ::mount("none", kMount.c_str(), "cgroup2", MS_REMOUNT, option);
}

TEST_F(OnLinux, AMinimumThatDoesNotProtectTheChildrenIsReported) {
  ASSERT_EQ(remountWith(""), 0);
  kernel_ = open();
  const GroupId parent = create("host/opt", "parent");
  setMemory(parent, 100, -1);
  EXPECT_TRUE(check(false).empty()) << "without children it protects the group itself";
  const GroupId child = create("host/opt/parent", "child");
  setMemory(child, 40, -1);
  const auto lines = check(false);
  ASSERT_EQ(lines.size(), 1U);
  EXPECT_THAT(lines[0], HasSubstr("host/opt/parent: 60 MB of its memory minimum protect nothing"));
  EXPECT_EQ(lookAtLinuxHost(configuration_).account[2].first, "protection");
  setMemory(child, 100, -1);
  EXPECT_TRUE(check(false).empty());
  EXPECT_EQ(remountWith("memory_recursiveprot"), 0);
}

// ---- a delegated directory

class Delegated : public OnLinux {
 protected:
  static constexpr uid_t kUser = 12345;

  void SetUp() override {
    OnLinux::SetUp();
    other_ = create("host/opt", "other");
    setMemory(other_, 30, -1);
    setCpuMin(other_, 20);
    theirs_ = create("host/opt", "theirs");
    setMemory(theirs_, 10, -1);
    setCpuMin(theirs_, 5);
    ASSERT_EQ(::chown((kMount / "host/opt/theirs").c_str(), kUser, kUser), 0);
  }

  // As the owner of the directory.
  void writeRecordOf(int64_t memoryMin, int64_t cpuMin, int64_t childrenSum) {
    elsewhere([&] {
      ASSERT_EQ(::setuid(kUser), 0);
      Record record = *decode(attribute("host/opt/theirs", kRecordAttribute));
      record.memory = {{memoryMin, -1, -1, -3}, childrenSum};
      record.cpu = {{cpuMin, -1, -1, -3}, childrenSum};
      const RecordBytes bytes = encode(record);
      setAttribute("host/opt/theirs", kRecordAttribute, {bytes.data(), bytes.size()});
    });
  }

  // Only the other group is left, with all that it reserved.
  void expectOnlyTheOther() {
    EXPECT_EQ(fileText("host", "memory.min"), "31457280");
    const Record opt = *decode(attribute("host/opt", kRecordAttribute));
    EXPECT_EQ(opt.memory.childrenSum, 30);
    EXPECT_EQ(opt.cpu.childrenSum, 20);
    EXPECT_TRUE(check(false).empty());
  }

  GroupId other_ = 0, theirs_ = 0;
};

TEST_F(Delegated, ARecordThatClaimsMoreReleasesOnlyWhatWasCounted) {
  for (const int64_t claimed : {11, 35, 1000000}) {
    SCOPED_TRACE(claimed);
    writeRecordOf(claimed, claimed, 0);
    kernel_->remove(theirs_);
    expectOnlyTheOther();
    theirs_ = create("host/opt", "theirs");
    setMemory(theirs_, 10, -1);
    setCpuMin(theirs_, 5);
    ASSERT_EQ(::chown((kMount / "host/opt/theirs").c_str(), kUser, kUser), 0);
  }
}

TEST_F(Delegated, ASumThatTheOwnerWroteReleasesOnlyWhatWasCounted) {
  writeRecordOf(10, 5, 1000000);
  kernel_->remove(theirs_);
  expectOnlyTheOther();
}

TEST_F(Delegated, ARecordThatClaimsMoreIsNotBelievedByRepair) {
  writeRecordOf(1000, 1000, 0);
  (void)check(true);
  EXPECT_EQ(fileText("host", "memory.min"), "41943040");
  EXPECT_TRUE(check(false).empty());
}

TEST_F(Delegated, AChangeOfItsMinimumTakesNothingFromTheOthers) {
  writeRecordOf(1000000, 1000000, 0);
  setMemory(theirs_, 4, -1);
  setCpuMin(theirs_, 4);
  EXPECT_EQ(fileText("host", "memory.min"), "35651584");
  kernel_->remove(theirs_);
  expectOnlyTheOther();
}

// ---- the machine out of memory

int adjOf(pid_t pid) {
  std::ifstream file("/proc/" + std::to_string(pid) + "/oom_score_adj");
  int value = 1;
  file >> value;
  return value;
}

int adjFor(int64_t minMB) {
  return oomScoreAdjFor(minMB, oomMachineBytes());
}

TEST_F(OnLinux, MembersFollowTheMinimumOfTheirGroup) {
  const GroupId id = create("host/opt", "pool");
  const Member member("");
  kernel_->join(id, member.pid());
  EXPECT_EQ(adjOf(member.pid()), 0);
  for (const int64_t min : {20, 60, 10, 0}) {
    setMemory(id, min, -1);
    EXPECT_EQ(adjOf(member.pid()), adjFor(min)) << min;
  }
  EXPECT_LT(adjFor(20), 0);
}

TEST_F(OnLinux, AProcessThatMovesGetsTheValueOfItsNewGroup) {
  const GroupId large = create("host/opt", "large"), small = create("host/opt", "small");
  const GroupId none = create("host/opt", "none");
  setMemory(large, 60, -1);
  setMemory(small, 20, -1);
  const Member member("");
  for (const auto &[id, min] : {std::pair(large, 60), std::pair(small, 20), std::pair(none, 0)}) {
    kernel_->join(id, member.pid());
    EXPECT_EQ(adjOf(member.pid()), adjFor(min)) << min;
  }
}

TEST_F(OnLinux, AnOomScoreAdjThatAnotherProgramChoseIsKept) {
  const GroupId id = create("host/opt", "pool");
  setMemory(id, 60, -1);
  const Member member("");
  std::ofstream("/proc/" + std::to_string(member.pid()) + "/oom_score_adj") << 7;
  kernel_->join(id, member.pid());
  setMemory(id, 20, -1);
  EXPECT_EQ(adjOf(member.pid()), 7);
  EXPECT_TRUE(check(false).empty());
}

TEST_F(OnLinux, AGroupWithAMinimumIsMarkedForSystemdOomd) {
  const GroupId id = create("host/opt", "pool");
  for (const int64_t min : {20, 0}) {
    setMemory(id, min, -1);
    for (const char *mark : {"user.oomd_avoid", "user.oomd_omit"}) {
      EXPECT_EQ(attribute("host/opt/pool", mark), min == 0 ? "" : "1");
    }
  }
}

// ---- what a process keeps open

TEST_F(OnLinux, ManyGroupsInUseKeepFewDescriptorsOpen) {
  std::vector<GroupId> ids;
  for (int i = 0; i < 200; ++i) {
    ids.push_back(create("host/opt", "pool" + std::to_string(i)));
    setMemory(ids.back(), 0, 10);
  }
  for (const GroupId id : ids) EXPECT_EQ(kernel_->readAllocation(id, Resource::kMemory).max, 10);
  long open = 0;
  for (const auto &entry : std::filesystem::directory_iterator("/proc/self/fd")) {
    open += entry.is_symlink() ? 1 : 0;
  }
  EXPECT_LT(open, 200);
}

TEST_F(OnLinux, ATreeThatOthersRemovedAndMadeAgainIsFound) {
  const GroupId before = create("host/opt", "pool");
  setMemory(before, 10, -1);
  removeTree("host");
  EXPECT_EQ(statusOfCall([&] { kernel_->readAllocation(before, Resource::kMemory); }),
            Status::kNotFound);
  const auto other = open();
  const GroupId after = other->create(other->lookUp("host/opt"), "pool");
  EXPECT_NE(after, before);
  EXPECT_EQ(kernel_->lookUp("host/opt/pool"), after);
  setMemory(after, 20, -1);
  EXPECT_EQ(fileText("host", "memory.min"), "20971520");
  EXPECT_EQ(kernel_->readAllocation(after, Resource::kMemory).min, 20);
}

TEST_F(OnLinux, WhatAnotherProcessSetOfANewGroupIsNotLost) {
  const GroupId id = create("host/opt", "pool");
  AllocationChange limit;
  limit.minLimit = 50;
  limit.min = 30;
  open()->setAllocation(id, Resource::kMemory, limit);
  setMemory(id, 40, 100);
  const Allocation memory = kernel_->readAllocation(id, Resource::kMemory);
  EXPECT_EQ(memory.minLimit, 50);
  EXPECT_EQ(memory.min, 40);
  EXPECT_EQ(fileText("host", "memory.min"), "41943040");
  EXPECT_TRUE(check(false).empty());
}

// ---- a new group, and other processes

TEST_F(OnLinux, ANewGroupHasARecordAtOnce) {
  create("host/opt", "pool");
  EXPECT_EQ(attribute("host/opt/pool", kRecordAttribute).size(), kRecordSize);
  EXPECT_EQ(attribute("host/opt", kRecordAttribute).size(), kRecordSize);
  EXPECT_EQ(attribute("host", kRecordAttribute).size(), kRecordSize);
}

TEST_F(OnLinux, AMaximumThatNoFileCanExpressIsInTheRecord) {
  const GroupId id = create("host/opt", "pool");
  const int64_t large = int64_t{1} << 43;
  setMemory(id, 0, large);
  EXPECT_EQ(fileText("host/opt/pool", "memory.max"), "max");
  EXPECT_EQ(open()->readAllocation(id, Resource::kMemory).max, large);
}

TEST_F(OnLinux, AReaderNeverSeesHalfOfAChange) {
  const GroupId id = create("host/opt", "pool");
  setMemory(id, 0, 100);
  const auto other = open();
  std::vector<std::pair<int64_t, int64_t>> seen;
  const auto look = [&] {
    const Allocation cpu = other->readAllocation(id, Resource::kCpu);
    seen.emplace_back(cpu.max, cpu.shares);
  };
  InterruptedCalls::beforeNextAttribute(look);
  InterruptedCalls::beforeEveryWrite(look);
  setCpu(id, 50, 2000);
  InterruptedCalls::beforeEveryWrite(nullptr);
  using Pair = std::pair<int64_t, int64_t>;
  EXPECT_THAT(seen, testing::ElementsAre(Pair(-1, -3), Pair(50, 2000), Pair(50, 2000)));
}

TEST_F(OnLinux, AGroupThatIsRemovedInTheMiddleOfAChangeIsNotFound) {
  const GroupId id = create("host/opt", "pool");
  setMemory(id, 0, 100);
  InterruptedCalls::beforeNextWrite([] { ::rmdir((kMount / "host/opt/pool").c_str()); });
  EXPECT_EQ(statusOfCall([&] { setCpu(id, 50, 2000); }), Status::kNotFound);
  EXPECT_TRUE(check(false).empty());
}

TEST_F(OnLinux, AReservationHoldsAtEveryStepOfAnotherChange) {
  const GroupId id = create("host/opt", "pool");
  setMemory(id, 0, 100);
  setCpuMinOf(*open(), id, 60);
  const auto look = [] { EXPECT_EQ(fileText("host/opt/pool", "cpu.weight"), "10000"); };
  InterruptedCalls::beforeEveryWrite(look);
  setCpu(id, 70, 2000);
  InterruptedCalls::beforeEveryWrite(nullptr);
  look();
  EXPECT_EQ(fileText("host/opt/pool", "cpu.max"), "70000 100000");
  EXPECT_TRUE(check(false).empty());
}

TEST_F(OnLinux, MemorySettingsOfAnotherProcessSurviveCpuSettings) {
  const GroupId id = create("host/opt", "pool");
  setMemory(id, 0, 100);
  AllocationChange limit;
  limit.max = 60;
  open()->setAllocation(id, Resource::kMemory, limit);
  setCpu(id, 50, 2000);
  EXPECT_EQ(kernel_->readAllocation(id, Resource::kMemory).max, 60);
  EXPECT_EQ(kernel_->readAllocation(id, Resource::kCpu).max, 50);
  EXPECT_EQ(fileText("host/opt/pool", "memory.max"), "62914560");
  EXPECT_EQ(fileText("host/opt/pool", "cpu.max"), "50000 100000");
  EXPECT_TRUE(check(false).empty());
}

TEST_F(OnLinux, CpuSettingsOfAnotherProcessSurviveARefusal) {
  const GroupId id = create("host/opt", "pool");
  const auto other = open();
  AllocationChange reserved;
  reserved.min = 60;
  reserved.max = 80;
  other->setAllocation(id, Resource::kCpu, reserved);
  AllocationChange tooLow;
  tooLow.max = 50;
  EXPECT_EQ(statusOfCall([&] { kernel_->setAllocation(id, Resource::kCpu, tooLow); }),
            Status::kBadParameter);
  EXPECT_EQ(fileText("host/opt/pool", "cpu.max"), "80000 100000");
  EXPECT_TRUE(check(false).empty());
}

TEST_F(OnLinux, ANewGroupThatAnotherProgramFilledIsBusy) {
  const GroupId id = create("host/opt", "pool");
  const Member member("host/opt/pool", 40);
  EXPECT_EQ(statusOfCall([&] { setMemory(id, 0, 10); }), Status::kMemoryBusy);
  EXPECT_EQ(fileText("host/opt/pool", "memory.max"), "max");
  EXPECT_THAT(fileText("host/opt/pool", "memory.events"), HasSubstr("oom_kill 0"));
}

TEST_F(OnLinux, ARemovedGroupIsNotFoundWhateverIsSet) {
  AllocationChange shares, max, bad;
  shares.shares = 1000;
  max.max = 50;
  bad.shares = -9;
  for (const AllocationChange &change : {shares, max, bad}) {
    for (const Resource resource : {Resource::kMemory, Resource::kCpu}) {
      const GroupId id = create("host/opt", "pool");
      if (resource == Resource::kCpu) setMemory(id, 0, 100);
      open()->remove(id);
      EXPECT_EQ(statusOfCall([&] { kernel_->setAllocation(id, resource, change); }),
                Status::kNotFound);
    }
  }
}

TEST_F(OnLinux, DefaultsReplaceWhatAnotherProcessSet) {
  const GroupId id = create("host/opt", "pool");
  AllocationChange change;
  change.min = 30;
  open()->setAllocation(id, Resource::kMemory, change);
  setMemory(id, 0, -1);
  EXPECT_EQ(kernel_->readAllocation(id, Resource::kMemory).min, 0);
  EXPECT_EQ(fileText("host", "memory.min"), "0");
  EXPECT_TRUE(check(false).empty());
}

// ---- CPU weights beside other groups

class BesideSlices : public OnLinux {
 protected:
  // The one that the end of the test removes.
  static void makeSlice(int weight) {
    ASSERT_EQ(::mkdir((kMount / "theirs").c_str(), 0755), 0);
    write("", "cgroup.subtree_control", "+memory +cpu");
    write("theirs", "cpu.weight", std::to_string(weight));
  }
};

TEST_F(BesideSlices, WithoutReservationsHostHasTheWeightOfItsShares) {
  makeSlice(10000);
  setCpu(create("host/opt", "pool"), 50, 2000);
  EXPECT_EQ(fileText("host", "cpu.weight"), "100");
  EXPECT_EQ(fileText("host/opt", "cpu.weight"), "100");
  EXPECT_EQ(fileText("host/opt/pool", "cpu.weight"), "200");
  EXPECT_TRUE(check(false).empty());
}

TEST_F(BesideSlices, AReservationWithinTheFairPartOfHostLeavesItsWeight) {
  makeSlice(100);
  setCpuMin(create("host/opt", "pool"), 40);
  EXPECT_EQ(fileText("host", "cpu.weight"), "100");
}

TEST_F(BesideSlices, ALargerReservationRaisesTheWeightOfHostAndReleasingItLowersIt) {
  makeSlice(100);
  const GroupId pool = create("host/opt", "pool");
  setCpuMin(pool, 80);
  EXPECT_EQ(fileText("host", "cpu.weight"), "433");
  EXPECT_TRUE(check(false).empty());
  setCpuMin(pool, 0);
  for (const char *group : {"host", "host/opt", "host/opt/pool"}) {
    EXPECT_EQ(fileText(group, "cpu.weight"), "100") << group;
  }
  EXPECT_TRUE(check(false).empty());
}

TEST_F(BesideSlices, AReservationThatHostCannotKeepIsRefusedWithTheirNames) {
  makeSlice(10000);
  const GroupId pool = create("host/opt", "pool");
  std::string text;
  EXPECT_EQ(statusOfCall([&] { setCpuMin(pool, 60); }, &text), Status::kReservationRefused);
  EXPECT_EQ(text,
            "no cpu.weight of host keeps its CPU reservation beside theirs (10000); lower their "
            "weights or reserve less");
  EXPECT_EQ(fileText("host", "cpu.weight"), "100");
  EXPECT_TRUE(check(false).empty());
}

TEST_F(BesideSlices, ASliceThatAppearsLaterIsReportedAndRepaired) {
  setCpuMin(create("host/opt", "pool"), 80);
  EXPECT_EQ(fileText("host", "cpu.weight"), "100");
  makeSlice(100);
  EXPECT_THAT(check(false), testing::Contains("host: cpu.weight is 100, not 433"));
  EXPECT_FALSE(check(true).empty());
  EXPECT_EQ(fileText("host", "cpu.weight"), "433");
  EXPECT_TRUE(check(false).empty());
}

TEST_F(BesideSlices, ASliceThatChangesIsTakenIntoAccountAtTheNextChange) {
  makeSlice(100);
  setCpuMin(create("host/opt", "pool"), 80);
  write("theirs", "cpu.weight", "200");
  create("host/opt", "other");
  EXPECT_EQ(fileText("host", "cpu.weight"), "866");
  EXPECT_TRUE(check(false).empty());
}

TEST_F(BesideSlices, ASliceTooHeavyForAReservationIsReportedAndHindersNoRelease) {
  makeSlice(100);
  const GroupId pool = create("host/opt", "pool");
  setCpuMin(pool, 80);
  write("theirs", "cpu.weight", "9000");
  EXPECT_THAT(check(true), testing::Contains(HasSubstr("beside theirs (9000)")));
  EXPECT_EQ(fileText("host", "cpu.weight"), "10000");
  setCpuMin(pool, 70);
  kernel_->remove(pool);
  EXPECT_EQ(fileText("host", "cpu.weight"), "100");
  EXPECT_TRUE(check(false).empty());
}

TEST_F(OnLinux, NewAndRemovedSiblingsLeaveWeightsThatCheckFindsRight) {
  setCpuMin(create("host/opt", "pool"), 30);
  std::vector<GroupId> siblings;
  for (int i = 0; i < 20; ++i) siblings.push_back(create("host/opt", "s" + std::to_string(i)));
  EXPECT_TRUE(check(false).empty());
  setCpuMin(siblings[3], 10);
  setCpu(siblings[4], -1, -4);
  setCpuMin(kernel_->create(siblings[5], "below"), 5);
  EXPECT_TRUE(check(false).empty());
  kernel_->remove(kernel_->lookUp("host/opt/s5/below"));
  for (const GroupId sibling : siblings) kernel_->remove(sibling);
  EXPECT_TRUE(check(false).empty());
}

TEST_F(OnLinux, AWriteThatFailsLeavesAllCpuWeightsAsTheyWere) {
  setCpuMin(create("host/opt", "pool"), 30);
  for (int i = 0; i < 8; ++i) create("host/opt", "s" + std::to_string(i));
  const auto weights = [] {
    std::vector<std::string> all = {fileText("host", "cpu.weight")};
    for (const auto &entry : std::filesystem::directory_iterator(kMount / "host/opt")) {
      if (entry.is_directory()) {
        all.push_back(fileText("host/opt" / entry.path().filename(), "cpu.weight"));
      }
    }
    return all;
  };
  const std::vector<std::string> before = weights();
  const GroupId last = kernel_->lookUp("host/opt/s7");
  for (int failing = 1; failing < 100; ++failing) {
    InterruptedCalls::failWrite(failing);
    const Status status = statusOfCall([&] { setCpuMin(last, 20); });
    InterruptedCalls::failWrite(0);
    if (status == Status::kSuccess) {
      EXPECT_GT(failing, 3);
      return;
    }
    ASSERT_EQ(weights(), before) << "write " << failing;
    ASSERT_TRUE(check(false).empty()) << "write " << failing;
  }
  FAIL() << "it never succeeded";
}

}  // namespace
}  // namespace Knob::Linux
