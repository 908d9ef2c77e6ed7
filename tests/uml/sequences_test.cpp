// SPDX-License-Identifier: Apache-2.0
// The emulated kernel, here, and the Linux kernel, in a machine of its own, answer the same random
// sequences of operations. Runs on this machine and boots the other one.
#include <gtest/gtest.h>

#include <sstream>

#include "process.h"
#include "temp_folder.h"
#include "world.h"

namespace Uml {
namespace {

constexpr unsigned kSequences = 2000;
constexpr unsigned kBoots = 4;  // that share them

class BothKernels : public testing::TestWithParam<unsigned> {
 protected:
  static ::Test::ProcessResult run(const std::string &program, ::Test::Arguments arguments) {
    ::Test::World world;
    world.environment["PATH"] = getenv("PATH");
    if (const char *ci = getenv("CI")) world.environment["CI"] = ci;
    ::Test::Command command;
    command.program = program;
    command.arguments = std::move(arguments);
    command.environment = world.environment;
    command.workingFolder = world.folder();
    command.limit = std::chrono::seconds(900);
    return ::Test::run(command);
  }

  static ::Test::ProcessResult runLinux(unsigned first, unsigned count, bool trees) {
    ::Test::Arguments arguments{"--limit=800",        "--mem=512M", "--",
                                RUN_SEQUENCES,        "linux",      std::to_string(first),
                                std::to_string(count)};
    if (trees) arguments.push_back("--trees");
    return run(UML_RUN, std::move(arguments));
  }

  // On a machine like the one that the other kernel found: its facts are its first line.
  static ::Test::ProcessResult runEmulated(const std::string &linux, unsigned first, unsigned count,
                                           bool trees) {
    const ::Test::TempFolder folder;
    std::istringstream facts(linux);
    std::string cpus, memoryMB;
    facts >> cpus >> memoryMB;
    ::Test::Arguments arguments{"emulated",
                                (folder.path() / "kernel.db").string(),
                                cpus,
                                memoryMB,
                                std::to_string(first),
                                std::to_string(count)};
    if (trees) arguments.push_back("--trees");
    return run(RUN_SEQUENCES, std::move(arguments));
  }
};

// The first line in which they differ, and the same sequence with its trees on both.
std::string firstDifference(const std::string &left, const std::string &right) {
  const std::vector<std::string> lefts = ::Test::lines(left), rights = ::Test::lines(right);
  for (size_t i = 0; i < lefts.size() && i < rights.size(); ++i)
    if (lefts[i] != rights[i]) return "linux:    " + lefts[i] + "\nemulated: " + rights[i] + "\n";
  return lefts.size() == rights.size() ? "" : "one is longer\n";
}

TEST_P(BothKernels, AnswerRandomSequencesWithTheSameStatusesAndTrees) {
  const unsigned count = kSequences / kBoots, first = GetParam() * count;
  const ::Test::ProcessResult linux = runLinux(first, count, false);
  if (linux.status == 77) GTEST_SKIP() << linux.out;
  ASSERT_EQ(linux.status, 0) << linux.out.substr(0, 2000) << linux.err;
  const ::Test::ProcessResult emulated = runEmulated(linux.out, first, count, false);
  ASSERT_EQ(emulated.status, 0) << emulated.err;
  EXPECT_GT(::Test::lines(linux.out).size(), count);
  if (linux.out == emulated.out) return;

  const std::string difference = firstDifference(linux.out, emulated.out);
  const unsigned culprit =
      static_cast<unsigned>(std::stoul(difference.substr(difference.find_first_of("0123456789"))));
  const std::string withTrees = runLinux(first, culprit - first + 1, true).out;
  ADD_FAILURE() << difference << "with the trees:\n"
                << firstDifference(withTrees,
                                   runEmulated(withTrees, first, culprit - first + 1, true).out);
}

INSTANTIATE_TEST_SUITE_P(Boot, BothKernels, testing::Range(0U, kBoots));

}  // namespace
}  // namespace Uml
