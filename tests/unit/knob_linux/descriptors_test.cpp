// SPDX-License-Identifier: Apache-2.0
// Descriptors that are closed together; control files that are read and written whole.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>

#include "knob/linux/cgroup_files.h"
#include "knob/linux/descriptor_set.h"
#include "knob/linux/fixed_groups.h"
#include "knob/linux/members.h"
#include "temp_folder.h"

namespace Knob::Linux {
namespace {

using Platform::UniqueFd;

bool isOpen(int descriptor) {
  return ::fcntl(descriptor, F_GETFD) >= 0;
}

int openNull() {
  return ::open("/dev/null", O_RDONLY | O_CLOEXEC);
}

TEST(DescriptorSet, ClosesAllThatItOwnsAndNothingBetween) {
  int own[5];
  int notOwn = -1;
  {
    DescriptorSet set;
    for (int i = 0; i < 5; ++i) {
      own[i] = openNull();
      set.add(own[i]);
      if (i == 2) notOwn = openNull();
    }
    for (const int descriptor : own) EXPECT_TRUE(isOpen(descriptor));
  }
  for (const int descriptor : own) EXPECT_FALSE(isOpen(descriptor)) << descriptor;
  EXPECT_TRUE(isOpen(notOwn));
  ::close(notOwn);
}

TEST(DescriptorSet, OneThatWasTakenOverIsClosedByItsNewOwner) {
  const int descriptor = openNull();
  DescriptorSet owner;
  {
    DescriptorSet first;
    first.add(descriptor);
    owner.take(std::move(first));
  }
  EXPECT_TRUE(isOpen(descriptor));
  owner = DescriptorSet();
  EXPECT_FALSE(isOpen(descriptor));
}

class ControlFile : public testing::Test {
 protected:
  ControlFile() : directory_(::open(folder_.path().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)) {}

  ::Test::TempFolder folder_;
  UniqueFd directory_;
};

TEST_F(ControlFile, IsReadWithoutItsLineEnd) {
  ::Test::writeFile(folder_.path() / "memory.max", "max\n");
  EXPECT_EQ(readControl(directory_.get(), "memory.max"), "max");
}

TEST_F(ControlFile, IsReadWholeHoweverLongItIs) {
  const std::string pids(100000, '7');
  ::Test::writeFile(folder_.path() / "cgroup.procs", pids);
  EXPECT_EQ(readControl(directory_.get(), "cgroup.procs"), pids);
}

TEST_F(ControlFile, OneThatIsMissingIsAnErrorOrNothing) {
  EXPECT_FALSE(readControlIfAny(directory_.get(), "memory.max"));
  EXPECT_THROW(readControl(directory_.get(), "memory.max"), KernelError);
}

TEST_F(ControlFile, IsNeverMadeByAWrite) {
  EXPECT_EQ(writeControl(directory_.get(), "memory.max", "1"), ENOENT);
  EXPECT_FALSE(std::filesystem::exists(folder_.path() / "memory.max"));
}

TEST_F(ControlFile, IsNeverCutByAWrite) {
  ::Test::writeFile(folder_.path() / "memory.max", "12345");
  EXPECT_EQ(writeControl(directory_.get(), "memory.max", "99"), 0);
  EXPECT_EQ(readControl(directory_.get(), "memory.max"), "99345");
}

TEST_F(ControlFile, NoLinkIsFollowed) {
  std::filesystem::create_symlink("/dev/null", folder_.path() / "memory.max");
  EXPECT_EQ(writeControl(directory_.get(), "memory.max", "1"), ELOOP);
}

TEST(Members, AreTheNumbersOfTheLines) {
  EXPECT_EQ(parseMembers("1\n23\n456\n"), (std::vector<int64_t>{1, 23, 456}));
  EXPECT_TRUE(parseMembers("").empty());
}

TEST(Members, AProcessThatCannotBeNamedIsLeftOut) {
  EXPECT_EQ(parseMembers("0\n23\n0"), (std::vector<int64_t>{23}));
}

TEST(Signature, ReadsBackAsItWasWritten) {
  const BuildSignature signature{"0123456789abcdef0123456789abcdef", "Nov 20 2026 13:55:19"};
  const auto again = parseSignature(signatureText(signature));
  ASSERT_TRUE(again);
  EXPECT_EQ(again->md5, signature.md5);
  EXPECT_EQ(again->buildDate, signature.buildDate);
}

TEST(Signature, AnythingElseIsNone) {
  for (const char *text : {"", " ", "short Nov 20 2026", "0123456789abcdef0123456789abcdef",
                           "0123456789abcdef0123456789abcdef "}) {
    EXPECT_FALSE(parseSignature(text)) << text;
  }
}

}  // namespace
}  // namespace Knob::Linux
