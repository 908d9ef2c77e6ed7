// SPDX-License-Identifier: Apache-2.0
// Names and paths that would lead out of the tree, into a control file or beyond what the kernel
// takes: each gets a clear status, and nothing outside the tree is touched.
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <fstream>
#include <set>

#include "control_files.h"
#include "knob_calls.h"
#include "temp_folder.h"
#include "worker.h"

namespace Uml {
namespace {

namespace fs = std::filesystem;

class HostileNames : public testing::Test {
 protected:
  // libknob reads its configuration once in a process.
  static void SetUpTestSuite() {
    static const ::Test::TempFolder folder;
    ::Test::writeFile(folder.path() / "knob.conf", "kernel = linux\n");
    setenv("KNOB_CONF", (folder.path() / "knob.conf").c_str(), 1);
  }

  void SetUp() override {
    startTreeAnew();
    ASSERT_EQ(lookUp("host/opt", &opt_), 0u);
    ASSERT_EQ(create(opt_, "web", &web_), 0u);
    before_ = everythingOutside();
  }

  void TearDown() override {
    EXPECT_EQ(everythingOutside(), before_) << "something beside the tree has changed";
    startTreeAnew();
  }

  // The groups beside "host", and what the root of the hierarchy passes on.
  static std::vector<std::string> everythingOutside() {
    std::vector<std::string> names{readControl("", "cgroup.subtree_control")};
    for (const auto &entry : fs::directory_iterator(kMount))
      if (entry.is_directory()) names.push_back(entry.path().filename().string());
    std::sort(names.begin(), names.end());
    return names;
  }

  void expectNoName(const std::string &name) {
    SCOPED_TRACE(name);
    const std::vector<std::string> groups = allGroups();
    int64_t id = -7;
    EXPECT_EQ(create(opt_, name, &id), kBadParameter);
    EXPECT_EQ(lookUp("host/opt/" + name, &id), kNotFound);
    EXPECT_EQ(lookUp("host/opt/" + name + "/web", &id), kNotFound);
    EXPECT_EQ(id, -7);
    EXPECT_EQ(allGroups(), groups);
  }

  int64_t opt_ = -1, web_ = -1;
  std::vector<std::string> before_;
};

TEST_F(HostileNames, DotsAndEmptyPartsNameNothing) {
  for (const char *name : {".", "..", "", "../opt", "./web", "a/b", "/", "web/", "..//"})
    expectNoName(name);
  int64_t id = -7;
  for (const char *path :
       {"", "/", "host/", "/host", "host//opt", "host/opt/", "host/./opt", "host/opt/../opt", "..",
        "../host", "host/opt/web/../web", "opt", "/sys/fs/cgroup/host", "host\n", " host"})
    EXPECT_EQ(lookUp(path, &id), kNotFound) << path;
  EXPECT_EQ(id, -7);
}

TEST_F(HostileNames, ALineFeedIsNoPartOfAName) {
  for (const char *name : {"\n", "a\nb", "web\n", "\nweb"}) expectNoName(name);
}

TEST_F(HostileNames, TheNamesOfControlFilesNameNothing) {
  for (const auto &entry : fs::directory_iterator(kMount / "host/opt/web"))
    if (entry.is_regular_file()) expectNoName(entry.path().filename().string());
  for (const char *name : {"cgroup.", "memory.x", "cpu.max.burst", "cpuset.cpus", "io.max",
                           "pids.max", "hugetlb.2MB.max", "rdma.max", "misc.max", "irq.pressure"})
    expectNoName(name);
}

TEST_F(HostileNames, A256thByteIsOneTooMany) {
  expectNoName(std::string(256, 'x'));
  expectNoName(std::string(5000, 'x'));
  int64_t id = -1, again = -2;
  EXPECT_EQ(create(opt_, std::string(255, 'x'), &id), 0u);
  EXPECT_EQ(lookUp("host/opt/" + std::string(255, 'x'), &again), 0u);
  EXPECT_EQ(id, again);
}

TEST_F(HostileNames, EveryOtherByteIsAsGoodAsALetter) {
  for (int byte = 1; byte < 256; ++byte) {
    if (byte == '\n' || byte == '/') continue;
    const std::string name = "n" + std::string(1, static_cast<char>(byte)) + "m";
    int64_t id = -1, again = -2;
    EXPECT_EQ(create(opt_, name, &id), 0u) << byte;
    EXPECT_EQ(lookUp("host/opt/" + name, &again), 0u) << byte;
    EXPECT_EQ(id, again) << byte;
    EXPECT_EQ(setMemory(id, {"min=1"}), 0u) << byte;
    EXPECT_EQ(numberIn("host/opt/" + name, "memory.min"), kMiB) << byte;
    EXPECT_EQ(destroy(id), 0u) << byte;
  }
  for (const char *name : {"~", "-rf", "...", " ", "\t", "\x1b[2J", "memory", "cpu", "cgroup",
                           "host", "opt", "\xff\xfe", "%s%n", "$(true)", "max"}) {
    int64_t id = -1;
    EXPECT_EQ(create(opt_, name, &id), 0u) << name;
    EXPECT_TRUE(groupExists("host/opt/" + std::string(name))) << name;
    EXPECT_EQ(destroy(id), 0u) << name;
  }
}

TEST_F(HostileNames, ALinkCannotEvenBeMadeInTheTree) {
  EXPECT_NE(symlink("/tmp", (kMount / "host/opt/link").c_str()), 0);
  EXPECT_EQ(errno, EPERM);
}

TEST_F(HostileNames, AMountInTheWayLeadsNowhere) {
  const fs::path web = kMount / "host/opt/web";
  ASSERT_EQ(mount("tmpfs", web.c_str(), "tmpfs", 0, nullptr), 0);
  fs::create_directory(web / "inside");
  fs::create_symlink("/sys/fs/cgroup", web / "link");
  const auto listing = [&] {
    std::set<std::string> names;
    for (const auto &entry : fs::directory_iterator(web)) names.insert(entry.path().string());
    return names;
  };
  const std::set<std::string> before = listing();
  int64_t id = -7;
  for (const char *path :
       {"host/opt/web", "host/opt/web/inside", "host/opt/web/link", "host/opt/web/link/host"})
    EXPECT_NE(lookUp(path, &id), 0u) << path;
  EXPECT_EQ(id, -7);
  // The group beneath is still the same one for those who know it by its id.
  EXPECT_EQ(setMemory(web_, {"min=8"}), 0u);
  int64_t child = -1;
  EXPECT_EQ(create(web_, "inside", &child), 0u);
  EXPECT_EQ(listing(), before);
  ASSERT_EQ(umount(web.c_str()), 0);
  EXPECT_EQ(numberIn("host/opt/web", "memory.min"), 8 * kMiB);
  EXPECT_TRUE(groupExists("host/opt/web/inside"));
  EXPECT_EQ(lookUp("host/opt/web", &id), 0u);
  EXPECT_EQ(id, web_);
}

TEST_F(HostileNames, MoreLevelsThanTheKernelAllowsAreRefused) {
  const std::string limit = readControl("host/opt", "cgroup.max.depth");
  writeControl("host/opt", "cgroup.max.depth", "3");
  int64_t parent = web_, id = -1;
  ASSERT_EQ(create(parent, "second", &parent), 0u);
  ASSERT_EQ(create(parent, "third", &parent), 0u);
  const std::vector<std::string> groups = allGroups();
  const KNOB_ReturnStatus status = create(parent, "fourth", &id);
  writeControl("host/opt", "cgroup.max.depth", limit);
  EXPECT_NE(status, 0u);
  EXPECT_NE(status, kExists);
  EXPECT_NE(status, kNotFound);
  EXPECT_EQ(allGroups(), groups);
  // A group that got no child has none in its files either, and still takes processes.
  Worker worker("host/opt/web/second/third", doNothing);
}

TEST_F(HostileNames, MoreGroupsThanTheKernelAllowsAreRefused) {
  const std::string limit = readControl("host/opt", "cgroup.max.descendants");
  writeControl("host/opt", "cgroup.max.descendants", "2");
  int64_t id = -1;
  EXPECT_EQ(create(opt_, "second", &id), 0u);
  const KNOB_ReturnStatus status = create(opt_, "third", &id);
  writeControl("host/opt", "cgroup.max.descendants", limit);
  EXPECT_NE(status, 0u);
  EXPECT_NE(status, kExists);
  EXPECT_FALSE(groupExists("host/opt/third"));
}

TEST_F(HostileNames, APathLongerThanTheKernelTakesAtOnceIsStillFound) {
  const std::string name(255, 'd');
  std::string path = "host/opt/web";
  std::vector<int64_t> ids{web_};
  for (int depth = 0; depth < 20; ++depth) {
    int64_t id = -1;
    ASSERT_EQ(create(ids.back(), name, &id), 0u) << depth;
    ids.push_back(id);
    path += "/" + name;
  }
  int64_t id = -1;
  EXPECT_EQ(lookUp(path, &id), 0u);
  EXPECT_EQ(id, ids.back());
  EXPECT_EQ(setMemory(id, {"min=2"}), 0u);
  EXPECT_EQ(numberIn("host", "memory.min"), 2 * kMiB);
  EXPECT_EQ(lookUp(path + "/x", &id), kNotFound);
  for (; ids.size() > 1; ids.pop_back()) EXPECT_EQ(destroy(ids.back()), 0u);
  EXPECT_EQ(numberIn("host", "memory.min"), 0);
}

TEST_F(HostileNames, AnIdThatNamesNoGroupOfTheTreeIsNotFound) {
  fs::create_directory(kMount / "beside");
  const auto beside = static_cast<int64_t>([&] {
    struct stat status {};
    stat((kMount / "beside").c_str(), &status);
    return status.st_ino;
  }());
  int count = -1;
  for (int64_t id :
       {int64_t{0}, int64_t{-1}, int64_t{1}, beside, web_ + 1000, INT64_MAX, INT64_MIN}) {
    EXPECT_EQ(setMemory(id, {"max=1"}), kNotFound) << id;
    EXPECT_EQ(destroy(id), kNotFound) << id;
    EXPECT_EQ(countChildren(id, &count), kNotFound) << id;
  }
  EXPECT_EQ(readControl("beside", "memory.max"), "max");
  fs::remove(kMount / "beside");
}

TEST_F(HostileNames, ADeletedGroupsIdNamesNothingAnyMore) {
  EXPECT_EQ(destroy(web_), 0u);
  int64_t next = -1;
  EXPECT_EQ(create(opt_, "web", &next), 0u);
  EXPECT_NE(next, web_);
  EXPECT_EQ(setMemory(web_, {"min=8"}), kNotFound);
  EXPECT_EQ(numberIn("host/opt/web", "memory.min"), 0);
}

TEST_F(HostileNames, AGroupWhoseLastChildIsGoneTakesProcessesAgain) {
  int64_t child = -1, other = -1;
  ASSERT_EQ(create(web_, "child", &child), 0u);
  ASSERT_EQ(create(opt_, "other", &other), 0u);
  Worker worker("host/opt/other", doNothing);
  EXPECT_EQ(join(web_, worker.pid()), kBusy);
  ASSERT_EQ(destroy(child), 0u);
  EXPECT_EQ(join(web_, worker.pid()), 0u);
  EXPECT_EQ(readControl("host/opt/web", "cgroup.procs"), std::to_string(worker.pid()));
  EXPECT_EQ(destroy(other), 0u);
}

TEST_F(HostileNames, AProcessThatIsNoneCannotJoin) {
  for (int64_t pid : {int64_t{0}, int64_t{-1}, int64_t{1} << 40, int64_t{30000}})
    EXPECT_EQ(join(web_, pid), kNotFound) << pid;
  EXPECT_EQ(readControl("host/opt/web", "cgroup.procs"), "");
}

}  // namespace
}  // namespace Uml
