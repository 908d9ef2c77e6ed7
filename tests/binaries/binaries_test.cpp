// SPDX-License-Identifier: Apache-2.0
// Every program and library, as built and as installed: where it looks for libraries, and what
// protects it when memory is damaged.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <string>
#include <vector>

#include "world.h"

namespace Test {
namespace {

namespace fs = std::filesystem;
using testing::AnyOf;
using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;

constexpr const char *kEndBranch = "\xF3\x0F\x1E\xFA";  // the instruction that marks a jump target

std::vector<std::string> split(const std::string &list, char separator) {
  std::vector<std::string> parts;
  for (size_t at = 0; at <= list.size();) {
    const size_t end = std::min(list.find(separator, at), list.size());
    parts.push_back(list.substr(at, end - at));
    at = end + 1;
  }
  return parts;
}

class Binaries : public testing::Test {
 protected:
  static std::vector<fs::path> built() {
    std::vector<fs::path> files;
    for (const std::string &name : split(BINARIES, ':')) files.emplace_back(name);
    return files;
  }

  std::vector<fs::path> installed() const {
    const fs::path prefix = world.folder() / "prefix";
    const ProcessResult result =
        world.run(CMAKE_PROGRAM, {"--install", BUILD_FOLDER, "--prefix", prefix.string()});
    EXPECT_EQ(result.status, 0) << result.out << result.err;
    std::vector<fs::path> files;
    for (const char *part : {"bin", "sbin", "lib"}) {
      for (const fs::directory_entry &entry : fs::directory_iterator(prefix / part))
        if (entry.is_regular_file() && !entry.is_symlink()) files.push_back(entry.path());
    }
    EXPECT_EQ(files.size(), built().size());
    return files;
  }

  std::string readelf(const std::string &what, const fs::path &file) const {
    const ProcessResult result = world.run(READELF, {what, "--wide", file.string()});
    EXPECT_EQ(result.status, 0) << result.err;
    return result.out;
  }

  // The folders in which FILE has the loader look, before the system's own.
  std::vector<std::string> searchPath(const fs::path &file) const {
    for (const std::string &line : lines(readelf("--dynamic", file))) {
      if (line.find("PATH)") == std::string::npos) continue;
      EXPECT_THAT(line, HasSubstr("(RUNPATH)")) << file << ": an RPATH hides LD_LIBRARY_PATH";
      return split(line.substr(line.find('[') + 1, line.rfind(']') - line.find('[') - 1), ':');
    }
    return {};
  }

  World world;
};

TEST_F(Binaries, BuiltOnesNeverLookInTheCurrentFolder) {
  for (const fs::path &file : built()) {
    for (const std::string &folder : searchPath(file))
      EXPECT_THAT(folder, AnyOf(StartsWith("$ORIGIN"), StartsWith("/"))) << file;
  }
}

TEST_F(Binaries, InstalledOnesNeverLookInTheCurrentFolder) {
  for (const fs::path &file : installed()) {
    for (const std::string &folder : searchPath(file))
      EXPECT_THAT(folder, AnyOf(StartsWith("$ORIGIN"), StartsWith("/"))) << file;
  }
}

TEST_F(Binaries, InstalledOnesNeverLookInTheBuildFolder) {
  for (const fs::path &file : installed())
    EXPECT_THAT(searchPath(file), Not(testing::Contains(BUILD_FOLDER "/lib"))) << file;
}

TEST_F(Binaries, ALibraryInTheCurrentFolderIsNotLoaded) {
  for (const char *library : {"libknob.so.1", "libkestrelconfig.so.1", "libkestrel-etcd.so.1"})
    writeFile(world.folder() / library, "not a library");
  for (const fs::path &program : built()) {
    if (program.parent_path().filename() != "bin") continue;
    const ProcessResult result = world.run(program.string(), {"--help"});
    EXPECT_THAT(result.err, Not(HasSubstr("shared libraries"))) << program;
    EXPECT_NE(result.status, 127) << program;
  }
}

TEST_F(Binaries, AddressesAreChosenAtRandom) {
  for (const fs::path &file : built())
    EXPECT_THAT(readelf("--file-header", file), HasSubstr("DYN"));
}

TEST_F(Binaries, TablesOfFunctionsAreReadOnlyOnceLoaded) {
  for (const fs::path &file : built()) {
    EXPECT_THAT(readelf("--program-headers", file), HasSubstr("GNU_RELRO")) << file;
    EXPECT_THAT(readelf("--dynamic", file), HasSubstr("NOW")) << file;
  }
}

TEST_F(Binaries, StacksAreNotExecutable) {
  for (const fs::path &file : built()) {
    for (const std::string &line : lines(readelf("--program-headers", file))) {
      if (line.find("GNU_STACK") != std::string::npos) {
        EXPECT_THAT(line, Not(HasSubstr("RWE"))) << file;
      }
    }
  }
}

TEST_F(Binaries, AnOverwrittenStackFrameEndsTheProgram) {
  for (const fs::path &file : built())
    EXPECT_THAT(readelf("--dyn-syms", file), HasSubstr("__stack_chk_fail")) << file;
}

TEST_F(Binaries, TargetsOfIndirectJumpsAreMarked) {
  if (HAS_CF_PROTECTION == 0) GTEST_SKIP() << "the compiler has no -fcf-protection";
  for (const fs::path &file : built()) {
    const std::string content = readFile(file);
    int marks = 0;
    for (size_t at = content.find(kEndBranch); at != content.npos;
         at = content.find(kEndBranch, at + 4))
      ++marks;
    EXPECT_GT(marks, 20) << file;
  }
}

// Not each file calls a function that has a checking form; the library of the Linux kernel does.
TEST_F(Binaries, CallsThatFillABufferAreChecked) {
  if (INSTRUMENTED) GTEST_SKIP() << "this build is instrumented";
  EXPECT_THAT(readelf("--dyn-syms", fs::path(BUILD_FOLDER) / "lib/libknob.so.1"),
              HasSubstr("_chk@"));
}

}  // namespace
}  // namespace Test
