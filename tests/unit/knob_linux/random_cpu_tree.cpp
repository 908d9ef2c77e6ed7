// SPDX-License-Identifier: Apache-2.0
// Everything random comes from one engine, so a tree depends on its number alone.
#include "random_cpu_tree.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <numeric>
#include <vector>

namespace Knob::Linux {
namespace {

constexpr size_t kMaxLevels = 4, kMaxGroups = 1200;
constexpr double kMaxReserved = 0.9;

void addGroups(CpuTree &tree, Random &random) {
  const auto levels = static_cast<size_t>(random.from(1, kMaxLevels));
  const int64_t maxChildren = std::array{3, 8, 50}[static_cast<size_t>(random.from(0, 2))];
  const bool haveEqualShares = random.oneIn(3);
  for (size_t group = 0; group < tree.groups().size() && tree.groups().size() < kMaxGroups;
       ++group) {
    const size_t level = tree[group].level;
    if (level == levels || (level > 0 && !random.oneIn(static_cast<int64_t>(2 * level)))) continue;
    const int64_t children = random.oneIn(4) ? maxChildren : random.from(1, maxChildren);
    for (int64_t i = 0; i < children; ++i) {
      tree.add(group, haveEqualShares ? 100 : randomShareWeight(random));
    }
  }
}

// Parts of one, in any proportion.
std::vector<double> randomParts(Random &random, size_t count) {
  const auto power = static_cast<double>(random.from(1, 3));
  std::vector<double> parts(count);
  for (double &part : parts) part = std::pow(random.fraction(), power) + 1e-9;
  const double sum = std::accumulate(parts.begin(), parts.end(), 0.0);
  for (double &part : parts) part /= sum;
  return parts;
}

void reserve(CpuTree &tree, Random &random, uint32_t cpus, Reservations reservations) {
  std::vector<size_t> groups;
  for (size_t i = 1; i < tree.groups().size(); ++i) {
    if (reservations == Reservations::kSpread || tree[i].children.empty()) groups.push_back(i);
  }
  for (size_t i = groups.size(); i-- > 1;) {
    std::swap(groups[i], groups[static_cast<size_t>(random.from(0, static_cast<int64_t>(i)))]);
  }
  const auto most = static_cast<int64_t>(groups.size());
  const int64_t few =
      reservations == Reservations::kConcentrated ? std::min<int64_t>(4, most) : most;
  const std::vector<double> parts = randomParts(random, static_cast<size_t>(random.from(1, few)));
  const double reserved = random.oneIn(10) ? kMaxReserved : kMaxReserved * random.fraction();
  for (size_t i = 0; i < parts.size(); ++i) {
    // A parent gets more than its children reserve so far.
    const auto more = static_cast<int64_t>(reserved * parts[i] * 100 * cpus);
    tree.setMin(groups[i], tree[groups[i]].reservation + more);
  }
}

}  // namespace

int64_t randomShareWeight(Random &random) {
  constexpr std::array<int64_t, 5> kUsual = {50, 100, 100, 200, 1};
  const auto choice = static_cast<size_t>(random.from(0, kUsual.size()));
  if (choice < kUsual.size()) return kUsual[choice];
  return std::clamp<int64_t>(std::llround(std::pow(10, 4 * random.fraction())), 1, 10000);
}

CpuTree randomCpuTree(Random &random, Reservations reservations) {
  constexpr std::array<uint32_t, 6> kCpus = {1, 2, 4, 8, 64, 256};
  const uint32_t cpus = kCpus[static_cast<size_t>(random.from(0, kCpus.size() - 1))];
  CpuTree tree(cpus);
  addGroups(tree, random);
  reserve(tree, random, cpus, reservations);
  weighBesideOthers(tree, random);
  return tree;
}

void weighBesideOthers(CpuTree &tree, Random &random) {
  do {
    uint64_t weight = 0;
    for (int64_t others = random.from(1, 6); others > 0; --others) {
      weight += static_cast<uint64_t>(random.oneIn(2) ? random.from(1, 10000)
                                                      : randomShareWeight(random));
    }
    tree.setOthersWeight(weight);
  } while (!tree.weighAll());
}

}  // namespace Knob::Linux
