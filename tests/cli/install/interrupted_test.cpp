// SPDX-License-Identifier: Apache-2.0
// A run of poolctl-install that is ended by a signal at any of its steps: the folder has all of the
// change or none of it, at once or after the next run.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/file.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <string>
#include <thread>
#include <vector>

#include "common/unique_fd.h"
#include "install_fixture.h"

namespace Test {
namespace {

namespace fs = std::filesystem;
using testing::AnyOf;
using testing::ElementsAre;
using testing::HasSubstr;

constexpr int kMaxSteps = 100;

class InterruptedInstall : public InstallFixture {
 protected:
  // Two installed files; the change replaces one, adds one and leaves one.
  void SetUp() override {
    InstallFixture::SetUp();
    fs::create_directory(world.folder() / "new");
    change = {source("new/a.yaml", kOther), source("new/c.yaml", kGood)};
    original = {source("a.yaml", kGood), source("b.yaml", kGood)};
  }

  void reset() {
    for (const std::string &name : entriesOf(world.rpD())) fs::remove(world.rpD() / name);
    ASSERT_EQ(install(original).status, 0);
  }

  ProcessResult installUntil(int step, int signal, const Arguments &arguments) {
    world.environment["LD_PRELOAD"] = KILL_AT_LIBRARY;
    world.environment["KILL_AT"] = std::to_string(step);
    world.environment["KILL_SIGNAL"] = std::to_string(signal);
    const ProcessResult result = install(arguments);
    world.environment.erase("LD_PRELOAD");
    return result;
  }

  // The installed files and their contents; readers see nothing else.
  std::string state() {
    std::string text;
    std::vector<std::string> names = entriesOf(world.rpD());
    std::sort(names.begin(), names.end());
    for (const std::string &name : names)
      if (name[0] != '.') text += name + "=" + readFile(world.rpD() / name) + ";";
    return text;
  }

  std::vector<std::string> hidden() {
    std::vector<std::string> names;
    for (const std::string &name : entriesOf(world.rpD()))
      if (name[0] == '.') names.push_back(name);
    return names;
  }

  const std::string before = std::string("a.yaml=") + kGood + ";b.yaml=" + kGood + ";";
  const std::string after =
      std::string("a.yaml=") + kOther + ";b.yaml=" + kGood + ";c.yaml=" + kGood + ";";
  Arguments change, original;
};

TEST_F(InterruptedInstall, TerminatedAnywhereItLeavesAllOrNone) {
  int steps = 0;
  for (int step = 1; step < kMaxSteps; ++step) {
    reset();
    const ProcessResult result = installUntil(step, SIGTERM, change);
    EXPECT_THAT(state(), AnyOf(before, after)) << "step " << step;
    EXPECT_THAT(hidden(), ElementsAre()) << "step " << step;
    if (result.signal == 0) break;
    EXPECT_EQ(result.signal, SIGTERM) << "step " << step;
    steps = step;
  }
  EXPECT_GT(steps, 10);
  EXPECT_EQ(state(), after);
}

TEST_F(InterruptedInstall, KilledAnywhereItIsUndoneByTheNextRun) {
  int undone = 0, steps = 0;
  for (int step = 1; step < kMaxSteps; ++step) {
    reset();
    const ProcessResult result = installUntil(step, SIGKILL, change);
    if (result.signal == 0) break;
    steps = step;
    const ProcessResult next = install({"--remove", "none.yaml"});
    EXPECT_EQ(next.status, 3) << next.err;
    if (next.err.find("undid the changes") != std::string::npos) ++undone;
    EXPECT_THAT(state(), AnyOf(before, after)) << "step " << step;
    EXPECT_THAT(hidden(), ElementsAre()) << "step " << step;
  }
  EXPECT_GT(steps, 10);
  EXPECT_GT(undone, 2);
}

TEST_F(InterruptedInstall, KilledRemovalIsUndoneByTheNextRun) {
  for (int step = 1; step < kMaxSteps; ++step) {
    reset();
    const ProcessResult result = installUntil(step, SIGKILL, {"--remove", "a.yaml", "b.yaml"});
    if (result.signal == 0) break;
    install({"--remove", "none.yaml"});
    EXPECT_THAT(state(), AnyOf(before, "")) << "step " << step;
    EXPECT_THAT(hidden(), ElementsAre()) << "step " << step;
  }
  EXPECT_EQ(state(), "");
}

TEST_F(InterruptedInstall, UndoThatIsKilledIsCompletedByTheNextRun) {
  for (int step = 1; step < kMaxSteps; ++step) {
    reset();
    for (int at = 1; !fs::exists(world.rpD() / ".install.journal"); ++at) {
      ASSERT_LT(at, kMaxSteps);
      installUntil(at, SIGKILL, change);
    }
    const ProcessResult result = installUntil(step, SIGKILL, {"--remove", "none.yaml"});
    if (result.signal == 0) break;
    install({"--remove", "none.yaml"});
    EXPECT_EQ(state(), before) << "step " << step;
    EXPECT_THAT(hidden(), ElementsAre()) << "step " << step;
  }
}

TEST_F(InterruptedInstall, CopiesArePrivateUntilTheyHaveBeenChecked) {
  reset();
  for (int step = 1; hidden().empty(); ++step) {
    ASSERT_LT(step, kMaxSteps);
    installUntil(step, SIGKILL, change);
    fs::remove(world.rpD() / ".install.lock");
  }
  for (const std::string &name : hidden()) {
    const fs::path copy = world.rpD() / name;
    EXPECT_NE(readFile(copy), "");
    EXPECT_EQ(fs::status(copy).permissions(), fs::perms::owner_read | fs::perms::owner_write);
  }
}

TEST_F(InterruptedInstall, ForeignHiddenFilesStay) {
  reset();
  for (const char *name : {".old.yaml", ".install.txt", ".a.yaml.swp"})
    writeFile(world.rpD() / name, "");
  EXPECT_EQ(install(change).status, 0);
  EXPECT_THAT(hidden(), testing::UnorderedElementsAre(".old.yaml", ".install.txt", ".a.yaml.swp"));
}

TEST_F(InterruptedInstall, JournalThatLeadsElsewhereIsRefused) {
  reset();
  writeFile(world.folder() / "victim", "");
  writeFile(world.rpD() / ".install.journal", std::string("../../victim\0\0", 14));
  const ProcessResult result = install(change);
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, HasSubstr("not a journal of poolctl-install"));
  EXPECT_TRUE(fs::exists(world.folder() / "victim"));
  EXPECT_EQ(state(), before);
}

TEST_F(InterruptedInstall, SecondRunWaitsForTheFirst) {
  reset();
  const fs::path lock = world.rpD() / ".install.lock";
  Platform::UniqueFd held(open(lock.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600));
  ASSERT_EQ(flock(held.get(), LOCK_EX), 0);
  std::thread releases([&] {
    std::this_thread::sleep_for(std::chrono::milliseconds(300));
    EXPECT_EQ(state(), before);
    held = Platform::UniqueFd();
  });
  EXPECT_EQ(install(change).status, 0);
  releases.join();
  EXPECT_EQ(state(), after);
  EXPECT_THAT(hidden(), ElementsAre());
}

}  // namespace
}  // namespace Test
