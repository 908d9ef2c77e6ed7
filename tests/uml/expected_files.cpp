// SPDX-License-Identifier: Apache-2.0
#include "expected_files.h"

#include <algorithm>
#include <sstream>
#include <vector>

#include "control_files.h"

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

int64_t weight(int64_t shares, int64_t reservedPercent, int64_t cpus) {
  static const std::map<int64_t, int64_t> levels{{-2, 50}, {-3, 100}, {-4, 200}};
  const auto level = levels.find(shares);
  const int64_t byShares = level == levels.end() ? shares / 10 : level->second;
  const int64_t byMinimum = (10000 * reservedPercent + 100 * cpus - 1) / (100 * cpus);
  return std::clamp<int64_t>(std::max(byShares, byMinimum), 1, 10000);
}

std::string linesOf(const std::string &memoryMin, const std::string &memoryMax,
                    const std::string &cpuMax, const std::string &cpuWeight) {
  return "memory.min: " + memoryMin + "\nmemory.max: " + memoryMax + "\ncpu.max: " + cpuMax +
         "\ncpu.weight: " + cpuWeight + "\n";
}

std::string linesFor(const std::string &group, const Pools &pools, int64_t cpus) {
  constexpr int64_t kNormal = -3;
  PoolNumbers pool;
  pool.cpuShares = kNormal;
  if (const auto found = pools.find(group); found != pools.end() && found->second.enabled)
    pool = found->second;
  // The least quota that the kernel takes is a thousandth of a second.
  const int64_t quota = std::max<int64_t>(pool.cpuMax * 1000, 1000);
  return linesOf(std::to_string(reservation(group, pools, &PoolNumbers::memMin) * kMiB),
                 pool.memMax == -1 ? "max" : std::to_string(pool.memMax * kMiB),
                 (pool.cpuMax == -1 ? "max" : std::to_string(quota)) + " 100000",
                 std::to_string(weight(pool.cpuShares,
                                       reservation(group, pools, &PoolNumbers::cpuMin), cpus)));
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
  std::map<std::string, std::string> files;
  for (const auto &[name, pool] : pools) {
    if (!pool.enabled) continue;
    for (std::string group = name; !group.empty(); group = parentOf(group))
      files[group] = linesFor(group, pools, cpus);
  }
  return files;
}

std::string actualFiles(const std::string &group) {
  return linesOf(readControl(group, "memory.min"), readControl(group, "memory.max"),
                 readControl(group, "cpu.max"), readControl(group, "cpu.weight"));
}

}  // namespace Uml
