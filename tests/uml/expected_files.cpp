// SPDX-License-Identifier: Apache-2.0
#include "expected_files.h"

#include <algorithm>
#include <set>
#include <sstream>
#include <vector>

#include "control_files.h"
#include "knob/linux/cpu_weights.h"

namespace Uml {
namespace {

int64_t numberOf(const std::string &cell) {
  static const std::map<std::string, int64_t> words{
      {"-", -1}, {"low", -2}, {"normal", -3}, {"high", -4}};
  const auto word = words.find(cell);
  return word == words.end() ? std::stoll(cell) : word->second;
}

std::string parentOf(const std::string &group) {
  const size_t slash = group.rfind('/');
  return slash == std::string::npos ? std::string() : group.substr(0, slash);
}

// What a group keeps for itself: its own minimum, or what those below keep if that is more.
int64_t reservation(const std::string &group, const Pools &pools, int64_t PoolNumbers::*minimum) {
  int64_t own = 0, below = 0;
  std::map<std::string, bool> children;
  for (const auto &[name, pool] : pools) {
    if (!pool.enabled) continue;
    if (name == group) own = pool.*minimum;
    if (name.size() <= group.size() || name.compare(0, group.size() + 1, group + "/") != 0)
      continue;
    const size_t end = name.find('/', group.size() + 1);
    children[name.substr(0, end)] = true;
  }
  for (const auto &child : children) below += reservation(child.first, pools, minimum);
  return std::max(own, below);
}

int64_t shareWeight(int64_t shares) {
  static const std::map<int64_t, int64_t> levels{{-2, 50}, {-3, 100}, {-4, 200}};
  const auto level = levels.find(shares);
  const int64_t weight = level == levels.end() ? shares / 10 : level->second;
  return std::clamp<int64_t>(weight, 1, 10000);
}

PoolNumbers numbersOf(const std::string &group, const Pools &pools) {
  constexpr int64_t kNormal = -3;
  PoolNumbers pool;
  pool.cpuShares = kNormal;
  if (const auto found = pools.find(group); found != pools.end() && found->second.enabled) {
    pool = found->second;
  }
  return pool;
}

// The CPU weights of a tree that has no group of another program beside it or in it.
class Weights {
 public:
  Weights(const Pools &pools, int64_t cpus) : pools_(pools), cpus_(static_cast<uint32_t>(cpus)) {
    for (const auto &[name, pool] : pools) {
      if (!pool.enabled) continue;
      for (std::string group = name; group != "host"; group = parentOf(group)) {
        children_[parentOf(group)].insert(group);
      }
    }
    children_["host"].insert("host/opt");
    weights_["host"] = childOf("host").shareWeight;
    weighBelow("host", Knob::Linux::kWholeMachine);
  }

  int64_t of(const std::string &group) const { return weights_.at(group); }

 private:
  Knob::Linux::CpuChild childOf(const std::string &group) const {
    return {Knob::Linux::machinePart(reservation(group, pools_, &PoolNumbers::cpuMin), cpus_),
            shareWeight(numbersOf(group, pools_).cpuShares)};
  }

  void weighBelow(const std::string &group, Knob::Linux::MachinePart guaranteed) {
    Knob::Linux::CpuParent parent;
    parent.guaranteed = guaranteed;
    int64_t reserved = 0;
    for (const std::string &child : children_[group]) {
      reserved += reservation(child, pools_, &PoolNumbers::cpuMin);
      parent.shareWeight += static_cast<uint64_t>(childOf(child).shareWeight);
      ++parent.children;
    }
    parent.reservation = Knob::Linux::machinePart(reserved, cpus_);
    const Knob::Linux::CpuDivision division = Knob::Linux::divideCpu(parent);
    for (const std::string &child : children_[group]) {
      weights_[child] = Knob::Linux::cpuWeightOf(division, childOf(child));
      weighBelow(child, Knob::Linux::guaranteedPart(division, childOf(child)));
    }
  }

  const Pools &pools_;
  uint32_t cpus_;
  std::map<std::string, std::set<std::string>> children_;
  std::map<std::string, int64_t> weights_;
};

std::string linesOf(const std::string &memoryMin, const std::string &memoryMax,
                    const std::string &cpuMax, const std::string &cpuWeight) {
  return "memory.min: " + memoryMin + "\nmemory.max: " + memoryMax + "\ncpu.max: " + cpuMax +
         "\ncpu.weight: " + cpuWeight + "\n";
}

std::string linesFor(const std::string &group, const Pools &pools, const Weights &weights) {
  const PoolNumbers pool = numbersOf(group, pools);
  // The least quota that the kernel takes is a thousandth of a second.
  const int64_t quota = std::max<int64_t>(pool.cpuMax * 1000, 1000);
  return linesOf(std::to_string(reservation(group, pools, &PoolNumbers::memMin) * kMiB),
                 pool.memMax == -1 ? "max" : std::to_string(pool.memMax * kMiB),
                 (pool.cpuMax == -1 ? "max" : std::to_string(quota)) + " 100000",
                 std::to_string(weights.of(group)));
}

}  // namespace

Pools parseList(const std::string &csv) {
  Pools pools;
  std::istringstream lines(csv);
  std::string line;
  std::getline(lines, line);  // the titles
  while (std::getline(lines, line)) {
    std::vector<std::string> cells;
    std::istringstream stream(line);
    for (std::string cell; std::getline(stream, cell, ',');) cells.push_back(cell);
    PoolNumbers pool;
    pool.enabled = cells.at(1) == "yes";
    pool.memMin = numberOf(cells.at(2));
    pool.memMax = numberOf(cells.at(3));
    pool.cpuMin = numberOf(cells.at(6));
    pool.cpuMax = numberOf(cells.at(7));
    pool.cpuShares = numberOf(cells.at(8));
    pools[cells.at(0)] = pool;
  }
  return pools;
}

std::map<std::string, std::string> expectedFiles(const Pools &pools, int64_t cpus) {
  const Weights weights(pools, cpus);
  std::map<std::string, std::string> files;
  for (const auto &[name, pool] : pools) {
    if (!pool.enabled) continue;
    for (std::string group = name; !group.empty(); group = parentOf(group))
      files[group] = linesFor(group, pools, weights);
  }
  return files;
}

std::string actualFiles(const std::string &group) {
  return linesOf(readControl(group, "memory.min"), readControl(group, "memory.max"),
                 readControl(group, "cpu.max"), readControl(group, "cpu.weight"));
}

}  // namespace Uml
