// SPDX-License-Identifier: Apache-2.0
// Measures the commands on definition files of four sizes: list against a bare yaml-cpp program,
// load and unload on the emulated kernel, and the start of the program. The two sides of a
// comparison alternate within one run, so that a change of the machine's load affects both.
//
// usage: bench_commands BIN_FOLDER BENCH_FOLDER WORK_FOLDER; scripts/run-bench calls it.
#include <cstdio>
#include <exception>
#include <string>
#include <vector>

#include "child_process.h"
#include "definitions.h"
#include "sample.h"

namespace {

using Bench::Cost;
using Bench::Sample;

struct Size {
  std::size_t pools;
  int repetitions;
};

constexpr Size kSizes[] = {{100, 101}, {1000, 41}, {10000, 15}, {50000, 7}};
constexpr int kStartRepetitions = 401;
constexpr double kListTimeGoal = 1.25;
constexpr double kMemoryGoal = 1.2;
constexpr double kStartGoal = 1.5;
constexpr double kLoadGoalMicroseconds = 100;

struct Programs {
  std::string poolctl, install, knobctl, bareWalk;
};

std::string writeInstalled(const Programs &programs, const std::string &folder, std::size_t pools) {
  const std::string path = folder + "/" + std::to_string(pools) + ".yaml";
  Bench::writeDefinitions(path, pools);
  Bench::runProgram({programs.install, "--mark", path});
  return path;
}

void compareList(const Programs &programs, const std::string &path, const Size &size) {
  Sample ours, bare, ratio, oursKB, bareKB;
  for (int i = 0; i < size.repetitions; ++i) {
    const Cost our = Bench::runProgram({programs.poolctl, "list", "-v", path});
    const Cost their = Bench::runProgram({programs.bareWalk, path});
    ours.add(our.wallMicroseconds / 1000);
    bare.add(their.wallMicroseconds / 1000);
    ratio.add(our.wallMicroseconds / their.wallMicroseconds);
    oursKB.add(our.peakKB);
    bareKB.add(their.peakKB);
  }
  std::printf("\nlist -v, %zu pools, %d runs\n", size.pools, size.repetitions);
  std::printf("  ms: poolctl %s, bare %s; KB: poolctl %.0f, bare %.0f\n", ours.text(2).c_str(),
              bare.text(2).c_str(), oursKB.median(), bareKB.median());
  Bench::printGoal("time, as a multiple of the bare program's", ratio.median(),
                   ratio.median() <= kListTimeGoal, "at most 1.25");
  const double memory = oursKB.median() / bareKB.median();
  Bench::printGoal("peak memory, likewise", memory, memory <= kMemoryGoal, "at most 1.2");
}

void measureLoad(const Programs &programs, const std::string &path, const Size &size) {
  Sample load, unload;
  for (int i = 0; i < size.repetitions; ++i) {
    const auto pools = static_cast<double>(size.pools);
    load.add(Bench::runProgram({programs.poolctl, "load", path}).wallMicroseconds / pools);
    unload.add(Bench::runProgram({programs.poolctl, "unload", path}).wallMicroseconds / pools);
  }
  std::printf("\nload and unload, %zu pools, %d runs, us a pool: load %s, unload %s\n", size.pools,
              size.repetitions, load.text(1).c_str(), unload.text(1).c_str());
  Bench::printGoal("load, us a pool", load.median(), load.median() <= kLoadGoalMicroseconds,
                   "at most 100");
  Bench::printGoal("unload, us a pool", unload.median(), unload.median() <= kLoadGoalMicroseconds,
                   "at most 100");
}

void compareStart(const Programs &programs, const std::string &path) {
  Sample ours, bare, ratio;
  for (int i = 0; i < kStartRepetitions; ++i) {
    const double our = Bench::runProgram({programs.poolctl, "list", path}).wallMicroseconds;
    const double their = Bench::runProgram({programs.bareWalk, path}).wallMicroseconds;
    ours.add(our / 1000);
    bare.add(their / 1000);
    ratio.add(our / their);
  }
  std::printf("\nStart: list on one pool, %d runs\n  ms: poolctl %s, bare %s\n", kStartRepetitions,
              ours.text(2).c_str(), bare.text(2).c_str());
  Bench::printGoal("time, as a multiple of the bare program's", ratio.median(),
                   ratio.median() <= kStartGoal, "at most 1.5");
}

void run(const Programs &programs, const std::string &folder) {
  Bench::runProgram({programs.knobctl, "boot", "--cpus", "8", "--memory", "1048576"});
  compareStart(programs, writeInstalled(programs, folder, 1));
  for (const Size &size : kSizes) {
    const std::string path = writeInstalled(programs, folder, size.pools);
    compareList(programs, path, size);
    measureLoad(programs, path, size);
  }
}

}  // namespace

int main(int argc, char **argv) {
  if (argc != 4) {
    std::fprintf(stderr, "usage: bench_commands BIN_FOLDER BENCH_FOLDER WORK_FOLDER\n");
    return 2;
  }
  const std::string bin = argv[1];
  const std::string bench = argv[2];
  std::setvbuf(stdout, nullptr, _IOLBF, 0);
  try {
    run({bin + "/poolctl", bin + "/poolctl-install", bin + "/knobctl", bench + "/bare_walk"},
        argv[3]);
  } catch (const std::exception &failure) {
    std::fprintf(stderr, "bench_commands: %s\n", failure.what());
    return 1;
  }
  return 0;
}
