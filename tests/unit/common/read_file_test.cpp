// SPDX-License-Identifier: Apache-2.0
#include "common/read_file.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>
#include <system_error>

#include "temp_folder.h"

namespace Platform {
namespace {

int errnoOf(const std::string &path, size_t maxBytes) {
  try {
    (void)readFile(path, maxBytes);
  } catch (const std::system_error &error) {
    return error.code().value();
  }
  return 0;
}

TEST(ReadFile, GivesEveryByte) {
  const ::Test::TempFolder folder;
  const std::string content = std::string("a\0b\n", 4) + std::string(10000, 'x');
  ::Test::writeFile(folder.path() / "file", content);
  EXPECT_EQ(readFile(folder.path() / "file", content.size()), content);
}

TEST(ReadFile, ReadsFilesThatHaveNoSize) {
  EXPECT_FALSE(readFile("/proc/self/stat", 65536).empty());
}

TEST(ReadFile, RefusesALargerFile) {
  const ::Test::TempFolder folder;
  ::Test::writeFile(folder.path() / "file", "12345");
  EXPECT_EQ(errnoOf(folder.path() / "file", 4), EFBIG);
}

TEST(ReadFile, SaysWhyItCannot) {
  const ::Test::TempFolder folder;
  EXPECT_EQ(errnoOf(folder.path() / "none", 10), ENOENT);
  EXPECT_EQ(errnoOf(folder.path(), 10), EISDIR);
}

TEST(ReadRegularFile, ReadsAFile) {
  const ::Test::TempFolder folder;
  ::Test::writeFile(folder.path() / "file", "content");
  EXPECT_EQ(readRegularFile(folder.path() / "file", 7), "content");
}

TEST(ReadRegularFile, RefusesAFifoWithoutWaitingForItsWriter) {
  const ::Test::TempFolder folder;
  const std::string fifo = folder.path() / "fifo";
  ASSERT_EQ(::mkfifo(fifo.c_str(), 0600), 0);
  try {
    (void)readRegularFile(fifo, 7);
    FAIL() << "read";
  } catch (const std::system_error &error) {
    EXPECT_EQ(error.code().message(), "not a regular file");
  }
}

TEST(ReadRegularFile, RefusesFoldersAndDevices) {
  for (const char *path : {"/dev/null", "/dev/zero", "/tmp"}) {
    EXPECT_THROW((void)readRegularFile(path, 7), std::system_error) << path;
  }
}

}  // namespace
}  // namespace Platform
