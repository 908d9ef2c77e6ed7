// SPDX-License-Identifier: Apache-2.0
// The entries of the definition folder as the system reports them, their types and its errors. The
// system's three functions are replaced here for that folder alone.
#include <dirent.h>
#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>
#include <string>
#include <system_error>
#include <vector>

#include "loader/definition_files.h"
#include "loader/file_error.h"

namespace {

struct Entry {
  const char *name;
  unsigned char type;
};

// What the folder reports: its entries, then the error; 0 is the end of the folder.
std::vector<Entry> entries;
int finalError;

size_t next;
int openFolders;
dirent current;

DIR *const kFake = reinterpret_cast<DIR *>(&entries);

template <typename Function>
Function *real(const char *name) {
  return reinterpret_cast<Function *>(dlsym(RTLD_NEXT, name));
}

}  // namespace

extern "C" DIR *opendir(const char *path) {
  if (std::strcmp(path, Loader::kDefinitionFolder) != 0) {
    return real<DIR *(const char *)>("opendir")(path);
  }
  ++openFolders;
  next = 0;
  return kFake;
}

extern "C" dirent *readdir(DIR *folder) {
  if (folder != kFake) return real<dirent *(DIR *)>("readdir")(folder);
  if (next == entries.size()) {
    if (finalError != 0) errno = finalError;
    return nullptr;
  }
  std::strcpy(current.d_name, entries[next].name);
  current.d_type = entries[next++].type;
  errno = ENOENT;  // a value that a successful call may leave
  return &current;
}

extern "C" int closedir(DIR *folder) {
  if (folder != kFake) return real<int(DIR *)>("closedir")(folder);
  --openFolders;
  return 0;
}

namespace {

class FolderListing : public testing::Test {
 protected:
  FolderListing() {
    entries.clear();
    finalError = 0;
  }
  void TearDown() override { EXPECT_EQ(0, openFolders); }

  // The files have no mark, so the first one that is taken ends the load and is named.
  static void expectTaken(const std::string &name) {
    try {
      Loader::loadPools({}, false);
      ADD_FAILURE() << name << " was not taken";
    } catch (const Loader::FileError &error) {
      EXPECT_EQ("/etc/rp.d/" + name + ": is not installed", error.what());
    }
  }
};

TEST_F(FolderListing, TakesRegularFiles) {
  entries = {{"no-such-file", DT_REG}};
  expectTaken("no-such-file");
}

TEST_F(FolderListing, SkipsEveryOtherType) {
  for (const unsigned char type :
       {DT_UNKNOWN, DT_FIFO, DT_CHR, DT_DIR, DT_BLK, DT_LNK, DT_SOCK, DT_WHT}) {
    entries = {{"no-such-file", type}};
    EXPECT_TRUE(Loader::loadPools({}, false).empty()) << int{type};
  }
}

TEST_F(FolderListing, TakesFilesInTheOrderOfTheFolder) {
  entries = {{"no-such-z", DT_REG}, {"no-such-a", DT_REG}};
  expectTaken("no-such-z");
}

TEST_F(FolderListing, ThatBreaksOffIsTheSystemsError) {
  for (const int error : {EIO, ENOMEM, EBADF}) {
    entries = {{".hidden", DT_REG}};
    finalError = error;
    try {
      Loader::loadPools({}, false);
      ADD_FAILURE() << "the error was lost: " << std::strerror(error);
    } catch (const std::system_error &failure) {
      EXPECT_EQ(std::error_code(error, std::generic_category()), failure.code());
      EXPECT_EQ(std::string("/etc/rp.d: ") + std::strerror(error), failure.what());
    }
  }
}

}  // namespace
