// SPDX-License-Identifier: Apache-2.0
// What is left of the machine for groups.
#include "knob/linux/capacity.h"

#include <fcntl.h>
#include <gtest/gtest.h>

#include <filesystem>

#include "temp_folder.h"

namespace Knob::Linux {
namespace {

constexpr const char *kMemInfo =
    "MemTotal:       8000000 kB\nHugePages_Total:      10\nHugepagesize:       2048 kB\n"
    "Hugetlb:           20481 kB\nDirectMap4k:      100 kB\n";

TEST(HugePages, AreThoseOfAllSizesRoundedUp) {
  EXPECT_EQ(hugePagesMB(kMemInfo), 21);
}

TEST(HugePages, Are0OnAKernelWithoutThem) {
  EXPECT_EQ(hugePagesMB("MemTotal: 8000000 kB\n"), 0);
  EXPECT_EQ(hugePagesMB(""), 0);
  EXPECT_EQ(hugePagesMB("Hugetlb:"), 0);
}

// A folder with a group beside host, on a machine of 2000 MB and 4 CPUs.
class MachineAccount : public testing::Test {
 protected:
  MachineAccount() {
    std::filesystem::create_directories(folder_.path() / "host");
    std::filesystem::create_directories(folder_.path() / "other.slice");
    ::Test::writeFile(folder_.path() / "host/memory.min", "1048576000\n");
    ::Test::writeFile(folder_.path() / "other.slice/memory.min", "104857601\n");
    hierarchy_.directory =
        Platform::UniqueFd(::open(folder_.path().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    hierarchy_.path = "/sys/fs/cgroup";
    facts_.cpus = 4;
    facts_.memoryKB = 2000 * 1024;
  }

  Account read(Resource resource, const Reserve &reserve = {}) {
    Account account = readAccount(resource, hierarchy_, facts_, reserve);
    // This machine's own huge pages.
    const auto isHuge = [](const Holder &holder) { return holder.name == "huge pages"; };
    account.holders.erase(std::remove_if(account.holders.begin(), account.holders.end(), isHuge),
                          account.holders.end());
    return account;
  }

  ::Test::TempFolder folder_;
  Hierarchy hierarchy_;
  HostFacts facts_;
};

TEST_F(MachineAccount, KeepsTheDefaultForTheSystemAndWhatOthersProtect) {
  const Account account = read(Resource::kMemory);
  EXPECT_EQ(account.total, 2000);
  EXPECT_EQ(account.capacity(), 2000 - 100 - 101);
  EXPECT_EQ(textOf(account), "100 MB for the system, 101 MB for /sys/fs/cgroup/other.slice");
}

TEST_F(MachineAccount, KeepsWhatTheConfigurationNames) {
  EXPECT_EQ(read(Resource::kMemory, {300, {}}).capacity(), 2000 - 300 - 101);
  EXPECT_EQ(read(Resource::kMemory, {0, {}}).capacity(), 2000 - 101);
  EXPECT_EQ(read(Resource::kCpu, {{}, 50}).capacity(), 350);
  EXPECT_EQ(textOf(read(Resource::kCpu, {{}, 0})), "nothing");
}

TEST_F(MachineAccount, KeepsAtLeast64MegabytesByDefault) {
  facts_.memoryKB = 400 * 1024;
  EXPECT_EQ(read(Resource::kMemory).holders.front().amount, 64);
  EXPECT_EQ(read(Resource::kCpu).holders.front().amount, 20);
}

TEST_F(MachineAccount, IsNeverNegative) {
  EXPECT_EQ(read(Resource::kMemory, {5000, {}}).capacity(), 0);
}

}  // namespace
}  // namespace Knob::Linux
