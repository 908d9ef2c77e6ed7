// SPDX-License-Identifier: Apache-2.0
// Whole stories on the emulated kernel. A case is a folder of "cases":
//   command         a shell script; the programs of the build stand in its search path
//   rp.d/           installed in /etc/rp.d before it runs
//   files/          installed in the folder that it runs in
//   stdout, stderr  what it must write, byte for byte; nothing when they are missing. The folder it
//                   runs in is written as FOLDER.
//   status          its exit status; 0 when missing
#include <algorithm>

#include "cli_fixture.h"

namespace Test {
namespace {

namespace fs = std::filesystem;

std::vector<std::string> caseNames() {
  std::vector<std::string> names;
  for (const fs::directory_entry &entry : fs::directory_iterator(CASES_FOLDER))
    names.push_back(entry.path().filename());
  std::sort(names.begin(), names.end());
  return names;
}

void install(const fs::path &from, const fs::path &to) {
  for (const fs::directory_entry &entry : fs::directory_iterator(from)) {
    const fs::path file = to / entry.path().filename();
    writeFile(file, readFile(entry.path()));
    setInstalledMark(file);
  }
}

class Case : public testing::TestWithParam<std::string> {};

TEST_P(Case, Runs) {
  const fs::path folder = fs::path(CASES_FOLDER) / GetParam();
  World world;
  if (fs::exists(folder / "rp.d")) {
    SKIP_WITHOUT_PRIVATE_ETC();
    install(folder / "rp.d", world.rpD());
  }
  if (fs::exists(folder / "files")) install(folder / "files", world.folder());
  const std::string status = readFile(folder / "status");
  const ProcessResult result = world.run("/bin/sh", {"-c", readFile(folder / "command")});
  EXPECT_EQ(withoutFolder(result.out, world), readFile(folder / "stdout"));
  EXPECT_EQ(withoutFolder(result.err, world), readFile(folder / "stderr"));
  EXPECT_EQ(result.status, status.empty() ? 0 : std::stoi(status));
}

INSTANTIATE_TEST_SUITE_P(Folder, Case, testing::ValuesIn(caseNames()), [](const auto &name) {
  std::string plain = name.param;
  std::replace(plain.begin(), plain.end(), '-', '_');
  return plain;
});

}  // namespace
}  // namespace Test
