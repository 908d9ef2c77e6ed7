// SPDX-License-Identifier: Apache-2.0
// The copy of a boot's facts beside the state: it saves work, and is never believed before the
// state.
#include "knob/emulated/boot_record.h"

#include <gtest/gtest.h>

#include <filesystem>

#include "common/sqlite.h"
#include "knob/emulated/boot.h"
#include "knob/emulated/emulated_kernel.h"
#include "temp_folder.h"

namespace Knob {
namespace {

class Facts : public testing::Test {
 protected:
  Facts() {
    configuration_.statePath = state_;
    boot(7, "quiet # not a comment\nsecond line \n");
  }

  void boot(uint32_t cpus, const std::string &commandLine) {
    BootFacts facts;
    facts.cpus = cpus;
    facts.memoryMB = 1000;
    facts.commandLine = commandLine;
    bootEmulatedKernel(configuration_, facts, true);
  }
  std::unique_ptr<Kernel> lazy() {
    return openEmulatedKernel(configuration_, Opening::kWhenNeeded);
  }
  void spoilTheStateItself() {
    Platform::Database(state_, Platform::Database::Mode::kReadWrite, 0)
        .execute("UPDATE kernel SET cpus = 9, build_date = 'of the state'");
  }

  const ::Test::TempFolder folder_;
  const std::string state_ = folder_.path() / "kernel.db";
  const std::string copy_ = state_ + "-facts";
  Configuration configuration_;
};

TEST_F(Facts, AreReadFromTheCopyWithoutTheState) {
  spoilTheStateItself();
  configuration_.maxVms = 12;
  const HostFacts facts = lazy()->facts();
  EXPECT_EQ(facts.cpus, 7U);
  EXPECT_EQ(facts.memoryKB, 1024000U);
  EXPECT_EQ(facts.maxVms, 12U);
  EXPECT_EQ(facts.bootCommandLine, "quiet # not a comment\nsecond line \n");
  EXPECT_NE(lazy()->signature().buildDate, "of the state");
}

TEST_F(Facts, AreReadFromTheStateOnceItIsOpen) {
  spoilTheStateItself();
  const auto kernel = lazy();
  (void)kernel->lookUp("host/opt");
  EXPECT_EQ(kernel->facts().cpus, 9U);
  EXPECT_EQ(kernel->signature().buildDate, "of the state");
}

TEST_F(Facts, AreReadFromTheStateWhenThereIsNoCopy) {
  spoilTheStateItself();
  std::filesystem::remove(copy_);
  EXPECT_EQ(lazy()->facts().cpus, 9U);
  EXPECT_EQ(lazy()->signature().buildDate, "of the state");
}

TEST_F(Facts, OfAnotherStateAreNotBelieved) {
  std::filesystem::copy(state_, state_ + ".other");
  std::filesystem::rename(state_ + ".other", state_);
  spoilTheStateItself();
  EXPECT_EQ(lazy()->facts().cpus, 9U);
}

TEST_F(Facts, ThatAreDamagedAreNotBelieved) {
  spoilTheStateItself();
  const std::string good = ::Test::readFile(copy_);
  const size_t cpus = good.find("\n7\n");
  ASSERT_NE(cpus, std::string::npos);
  for (const std::string &bad :
       {std::string(), good.substr(0, cpus + 1), std::string("x") + good,
        good.substr(0, cpus + 1) + "many" + good.substr(cpus + 2), std::string(100000, 'x')}) {
    ::Test::writeFile(copy_, bad);
    EXPECT_EQ(lazy()->facts().cpus, 9U) << bad.substr(0, 200);
  }
}

TEST_F(Facts, ChangeWithTheNextBoot) {
  boot(3, "other");
  EXPECT_EQ(lazy()->facts().cpus, 3U);
  EXPECT_EQ(lazy()->facts().bootCommandLine, "other");
}

TEST_F(Facts, AreGoneWithTheirState) {
  std::filesystem::remove(state_);
  EXPECT_NE(lazy()->facts().bootCommandLine, "quiet # not a comment\nsecond line \n");
  EXPECT_FALSE(readBootRecord(folder_.path() / "none.db"));
}

TEST_F(Facts, ThatCannotBeWrittenAreDoneWithout) {
  std::filesystem::remove(copy_);
  std::filesystem::create_directory(copy_);
  boot(5, "no room");
  EXPECT_EQ(lazy()->facts().cpus, 5U);
}

TEST_F(Facts, AndTheMostMachinesOfTheBootAreKept) {
  BootFacts facts;
  facts.maxVms = UINT32_MAX;
  bootEmulatedKernel(configuration_, facts, true);
  EXPECT_EQ(lazy()->facts().maxVms, UINT32_MAX);
}

}  // namespace
}  // namespace Knob
