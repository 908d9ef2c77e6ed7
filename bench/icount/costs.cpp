// SPDX-License-Identifier: Apache-2.0
// What the commands cost in instructions, on a kernel as it runs on hardware. The machine's clock
// counts instructions (smp-run --icount), one a nanosecond, so the figures repeat within some
// percent on any machine, however busy. A wait for a timer counts as well: joining a group waits
// for all readers of the kernel's process tree (RCU). Each command is compared with the least that
// any program would have to do: the same system calls in a bare loop, and a bare walk through the
// same YAML.
//
// usage: bench_icount BIN_FOLDER BENCH_FOLDER, in a machine of its own
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <filesystem>
#include <fstream>
#include <limits>
#include <string>
#include <thread>
#include <vector>

#include "child_process.h"
#include "pools.h"
#include "sample.h"

namespace {

namespace fs = std::filesystem;

constexpr int kPools = 1000;
constexpr int kRounds = 3;
constexpr int kExecRounds = 10;
constexpr double kLoadGoal = 1.15, kUnloadGoal = 1.15, kExecGoal = 1.2;

// The least cost of the rounds: what the kernel still does for the round before comes on top of
// the others.
class Least {
 public:
  void add(const Bench::Cost &cost) {
    all_ = std::min(all_, cost.wallMicroseconds);
    own_ = std::min(own_, cost.cpuMicroseconds);
  }

  // From the command's start to its end, with what the kernel's own threads did meanwhile.
  double all() const { return all_; }

  // What the command's process itself executed, in the kernel too.
  double own() const { return own_; }

 private:
  double all_ = std::numeric_limits<double>::infinity();
  double own_ = std::numeric_limits<double>::infinity();
};

// Removing groups leaves work behind for the kernel's own threads. In this machine, waiting costs
// nothing.
Bench::Cost costOf(const std::vector<std::string> &commandLine) {
  std::this_thread::sleep_for(std::chrono::seconds(1));
  return Bench::runProgram(commandLine);
}

void print(const char *what, const Least &least, int count) {
  std::printf("  %-44s %9.0f %9.0f\n", what, least.all() * 1000 / count,
              least.own() * 1000 / count);
}

struct Programs {
  std::string bin, bench;
};

struct LoadCosts {
  Least bareMake, bareRemove, walk, load, unload;
};

LoadCosts measureLoad(const Programs &programs, const fs::path &definitions) {
  const fs::path bareParent = Bench::makePoolParent("bare");
  const std::string bareGroups = programs.bench + "/bare_groups";
  const std::string poolctl = programs.bin + "/poolctl", count = std::to_string(kPools);
  LoadCosts costs;
  for (int round = 0; round < kRounds; ++round) {
    costs.walk.add(costOf({programs.bench + "/bare_walk", definitions}));
    costs.bareMake.add(costOf({bareGroups, "make", bareParent, count}));
    Bench::requirePoolGroups(bareParent, kPools);
    costs.bareRemove.add(costOf({bareGroups, "remove", bareParent, count}));
    costs.load.add(costOf({poolctl, "load", definitions}));
    Bench::requirePoolGroups(fs::path(Bench::kCgroupMount) / "host/opt", kPools);
    costs.unload.add(costOf({poolctl, "unload", definitions}));
  }
  return costs;
}

void reportLoad(const LoadCosts &costs) {
  std::printf("\n%d pools, nanoseconds a pool, the least of %d rounds; of the process itself\n",
              kPools, kRounds);
  print("poolctl load", costs.load, kPools);
  print("bare loop: mkdir, and a write to each file", costs.bareMake, kPools);
  print("poolctl unload", costs.unload, kPools);
  print("bare loop: rmdir", costs.bareRemove, kPools);
  print("bare walk through the definitions", costs.walk, kPools);
  const double load = costs.load.all() / (costs.bareMake.all() + costs.walk.all());
  Bench::printGoal("load, as a multiple of bare loop and walk", load, load <= kLoadGoal,
                   "at most 1.15");
  const double unload = costs.unload.all() / (costs.bareRemove.all() + costs.walk.all());
  Bench::printGoal("unload, as a multiple of bare loop and walk", unload, unload <= kUnloadGoal,
                   "at most 1.15");
}

void measureExec(const Programs &programs, const fs::path &definitions) {
  Bench::runProgram({programs.bin + "/poolctl", "load", definitions});
  const std::string name = Bench::poolName(0);
  const fs::path group = fs::path(Bench::kCgroupMount) / "host/opt" / name;
  Least own, bare;
  for (int round = 0; round < kExecRounds; ++round) {
    own.add(costOf({programs.bin + "/poolctl-exec", name, "--", "/bin/true"}));
    bare.add(costOf({programs.bench + "/bare_exec", group, "/bin/true"}));
  }
  std::printf(
      "\nstarting /bin/true in a pool, nanoseconds, the least of %d rounds; of the process "
      "itself\n",
      kExecRounds);
  print("poolctl-exec", own, 1);
  print("bare join and exec", bare, 1);
  const double ratio = own.all() / bare.all();
  Bench::printGoal("poolctl-exec, as a multiple of the bare one", ratio, ratio <= kExecGoal,
                   "at most 1.2");
}

}  // namespace

int main(int argc, char **argv) {
  if (argc != 3 || getenv("SMP_MACHINE") == nullptr) {
    std::fprintf(stderr,
                 "usage: tests/smp/smp-run --icount -- bench_icount BIN_FOLDER BENCH_FOLDER\n");
    return 2;
  }
  try {
    const fs::path work = getenv("TMPDIR");
    std::ofstream(work / "knob.conf") << "kernel = linux\n";
    setenv("KNOB_CONF", (work / "knob.conf").c_str(), 1);
    const Programs programs{argv[1], argv[2]};
    const fs::path definitions = work / "pools.yaml";
    Bench::writePoolDefinitions(definitions, kPools);
    Bench::runProgram({programs.bin + "/poolctl-install", "--mark", definitions});
    reportLoad(measureLoad(programs, definitions));
    measureExec(programs, definitions);
  } catch (const std::exception &failure) {
    std::fprintf(stderr, "bench_icount: %s\n", failure.what());
    return 1;
  }
  return 0;
}
