// SPDX-License-Identifier: Apache-2.0
// Loading pools on the Linux kernel, against a bare loop of the same writes (bare_groups) and
// against Debian's cgconfigparser on the same groups and values. System calls and page faults of
// this machine cost many times what they cost elsewhere, so only the ratios mean anything. The
// sides take turns. What any program pays that loads yaml-cpp and reads the definitions (bare_walk)
// is shown beside them: it is a part of load's time that no kernel call can make up for.
//
// usage: bench_linux BIN_FOLDER BENCH_FOLDER, in a machine of its own
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <filesystem>
#include <fstream>
#include <stdexcept>
#include <string>

#include "child_process.h"
#include "pools.h"
#include "sample.h"

namespace {

namespace fs = std::filesystem;
using Bench::Sample;

struct Size {
  int pools;
  int repetitions;
  int parserRepetitions;  // of the slow one
};

constexpr Size kSizes[] = {{100, 15, 3}, {1000, 9, 1}, {5000, 5, 1}};
constexpr double kBareGoal = 1.5;
constexpr double kParserGoal = 10;
constexpr double kGrowthGoal = 1.2;

void writeParserConfiguration(const fs::path &path, int pools) {
  std::ofstream file(path);
  for (int i = 0; i < pools; ++i) {
    file << "group parser/opt/" << Bench::poolName(i) << " {\n  memory {\n    memory.min = \""
         << Bench::poolMinimumMB(i) * 1048576
         << "\";\n    memory.max = \"67108864\";\n  }\n  cpu {\n"
         << "    cpu.max = \"50000 100000\";\n    cpu.weight = \"200\";\n  }\n}\n";
  }
}

struct Result {
  Sample load, unload, bare, reading, parser, againstBare;
};

Result measure(const std::string &bin, const std::string &bench, const Size &size) {
  const fs::path work = getenv("TMPDIR");
  const fs::path definitions = work / "pools.yaml", configuration = work / "parser.conf";
  Bench::writePoolDefinitions(definitions, size.pools);
  writeParserConfiguration(configuration, size.pools);
  Bench::runProgram({bin + "/poolctl-install", "--mark", definitions});
  const fs::path bareParent = Bench::makePoolParent("bare"),
                 parserParent = Bench::makePoolParent("parser");
  const double pools = size.pools;
  Result result;
  for (int i = 0; i < size.repetitions; ++i) {
    const double bare =
        Bench::runProgram({bench + "/bare_groups", "make", bareParent, std::to_string(size.pools)})
            .wallMicroseconds;
    Bench::requirePoolGroups(bareParent, size.pools);
    Bench::removePoolGroups(bareParent, size.pools);
    const double load = Bench::runProgram({bin + "/poolctl", "load", definitions}).wallMicroseconds;
    Bench::requirePoolGroups(fs::path(Bench::kCgroupMount) / "host/opt", size.pools);
    result.unload.add(
        Bench::runProgram({bin + "/poolctl", "unload", definitions}).wallMicroseconds / pools);
    result.reading.add(Bench::runProgram({bench + "/bare_walk", definitions}).wallMicroseconds /
                       pools);
    result.bare.add(bare / pools);
    result.load.add(load / pools);
    result.againstBare.add(load / bare);
  }
  for (int i = 0; i < size.parserRepetitions; ++i) {
    result.parser.add(
        Bench::runProgram({"/usr/sbin/cgconfigparser", "-l", configuration}).wallMicroseconds /
        pools);
    Bench::requirePoolGroups(parserParent, size.pools);
    Bench::removePoolGroups(parserParent, size.pools);
  }
  return result;
}

void run(const std::string &bin, const std::string &bench) {
  double smallest = 0;
  for (const Size &size : kSizes) {
    const Result result = measure(bin, bench, size);
    std::printf("\nload on the Linux kernel, %d pools, %d runs (cgconfigparser: %d)\n", size.pools,
                size.repetitions, size.parserRepetitions);
    std::printf(
        "  us a pool: poolctl load %s, unload %s\n             bare loop %s, "
        "cgconfigparser %s\n             reading the definitions, and no more %s\n",
        result.load.text(0).c_str(), result.unload.text(0).c_str(), result.bare.text(0).c_str(),
        result.parser.text(0).c_str(), result.reading.text(0).c_str());
    const double bare = result.againstBare.median();
    Bench::printGoal("load, as a multiple of the bare loop's time", bare, bare <= kBareGoal,
                     "at most 1.5");
    std::printf("  the best run of each: load %.0f, bare loop %.0f, %.2f times as much\n",
                result.load.quantile(0), result.bare.quantile(0),
                result.load.quantile(0) / result.bare.quantile(0));
    const double parser = result.parser.median() / result.load.median();
    Bench::printGoal("cgconfigparser, as a multiple of load's time", parser, parser >= kParserGoal,
                     "at least 10");
    if (smallest == 0) smallest = result.load.median();
    if (size.pools == kSizes[2].pools) {
      const double growth = result.load.median() / smallest;
      Bench::printGoal("load of a pool among 5000, as a multiple of that among 100", growth,
                       growth <= kGrowthGoal, "at most 1.2");
    }
  }
}

}  // namespace

int main(int argc, char **argv) {
  if (argc != 3 || getenv("UML_MACHINE") == nullptr) {
    std::fprintf(stderr, "usage: tests/uml/uml-run -- bench_linux BIN_FOLDER BENCH_FOLDER\n");
    return 2;
  }
  std::setvbuf(stdout, nullptr, _IOLBF, 0);
  try {
    const std::string configuration = std::string(getenv("TMPDIR")) + "/knob.conf";
    std::ofstream(configuration) << "kernel = linux\n";
    setenv("KNOB_CONF", configuration.c_str(), 1);
    run(argv[1], argv[2]);
  } catch (const std::exception &failure) {
    std::fprintf(stderr, "bench_linux: %s\n", failure.what());
    return 1;
  }
  return 0;
}
