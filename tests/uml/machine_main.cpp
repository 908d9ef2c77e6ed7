// SPDX-License-Identifier: Apache-2.0
// main() of the tests that change the control groups of the kernel that they run on: they run in a
// machine of their own, user-mode Linux (uml-run) or QEMU (smp-run), and refuse every other.
#include <gtest/gtest.h>

#include <cstdlib>
#include <fstream>
#include <iostream>
#include <iterator>
#include <string>

namespace {

bool fileHolds(const char *path, const char *text) {
  std::ifstream file(path);
  const std::string content{std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
  return content.find(text) != std::string::npos;
}

bool isThrowAwayMachine() {
  if (getenv("UML_MACHINE") != nullptr) return fileHolds("/proc/cpuinfo", "User Mode Linux");
  return getenv("SMP_MACHINE") != nullptr && fileHolds("/proc/cmdline", "smp_run.machine");
}

}  // namespace

int main(int argc, char **argv) {
  testing::InitGoogleTest(&argc, argv);
  if (!testing::GTEST_FLAG(list_tests) && !isThrowAwayMachine()) {
    std::cerr << argv[0] << ": run this with tests/uml/uml-run or tests/smp/smp-run" << std::endl;
    return 2;
  }
  return RUN_ALL_TESTS();
}
