// SPDX-License-Identifier: Apache-2.0
// main() of the tests that change the control groups of the kernel that they run on: they run in a
// user-mode Linux machine of their own (uml-run), and refuse every other.
#include <gtest/gtest.h>

#include <cstdlib>
#include <fstream>
#include <iostream>
#include <iterator>
#include <string>

namespace {

bool isThrowAwayMachine() {
  std::ifstream file("/proc/cpuinfo");
  const std::string text{std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
  return getenv("UML_MACHINE") != nullptr && text.find("User Mode Linux") != std::string::npos;
}

}  // namespace

int main(int argc, char **argv) {
  testing::InitGoogleTest(&argc, argv);
  if (!testing::GTEST_FLAG(list_tests) && !isThrowAwayMachine()) {
    std::cerr << argv[0] << ": run this with tests/uml/uml-run" << std::endl;
    return 2;
  }
  return RUN_ALL_TESTS();
}
