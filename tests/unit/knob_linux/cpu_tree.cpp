// SPDX-License-Identifier: Apache-2.0
// The parts are those of an ideal scheduler: a busy parent's time is divided among its busy
// children in proportion to their weights.
#include "cpu_tree.h"

#include <algorithm>

namespace Knob::Linux {

size_t CpuTree::add(size_t parent, int64_t shareWeight) {
  const size_t added = groups_.size();
  Group group;
  group.parent = parent;
  group.level = groups_[parent].level + 1;
  group.shareWeight = shareWeight;
  groups_.push_back(group);
  groups_[parent].children.push_back(added);
  groups_[parent].childrenShareWeight += static_cast<uint64_t>(shareWeight);
  return added;
}

void CpuTree::remove(size_t group) {
  Group &parent = groups_[groups_[group].parent];
  setMin(group, 0);
  parent.children.erase(std::find(parent.children.begin(), parent.children.end(), group));
  parent.childrenShareWeight -= static_cast<uint64_t>(groups_[group].shareWeight);
}

void CpuTree::setMin(size_t group, int64_t percent) {
  groups_[group].min = percent;
  for (;; group = groups_[group].parent) {
    sumUp(group);
    if (group == kHost) break;
  }
}

void CpuTree::sumUp(size_t group) {
  Group &sum = groups_[group];
  sum.childrenReservation = 0;
  for (size_t child : sum.children) sum.childrenReservation += groups_[child].reservation;
  sum.reservation = std::max(sum.min, sum.childrenReservation);
}

void CpuTree::setShareWeight(size_t group, int64_t shareWeight) {
  uint64_t &sum = groups_[groups_[group].parent].childrenShareWeight;
  sum += static_cast<uint64_t>(shareWeight) - static_cast<uint64_t>(groups_[group].shareWeight);
  groups_[group].shareWeight = shareWeight;
}

CpuChild CpuTree::childOf(const Group &group) const {
  return {machinePart(group.reservation, cpus_), group.shareWeight};
}

CpuDivision CpuTree::divisionOf(const Group &group, MachinePart guaranteed) const {
  return divideCpu({guaranteed, machinePart(group.childrenReservation, cpus_),
                    group.childrenShareWeight, group.children.size()});
}

std::optional<HostCpu> CpuTree::weighHost() {
  const HostCpu host = hostCpu(childOf(groups_[kHost]), othersWeight_);
  if (!host.keepsReservation) return std::nullopt;
  groups_[kHost].weight = host.weight;
  return host;
}

bool CpuTree::settle(size_t changed) {
  const auto host = weighHost();
  if (!host) return false;
  std::vector<size_t> chain;
  for (; changed != kHost; changed = groups_[changed].parent) chain.push_back(changed);
  settleBelow(kHost, host->guaranteed, chain);
  return true;
}

// chain: the groups whose reservation or shares may have changed.
void CpuTree::settleBelow(size_t group, MachinePart guaranteed, const std::vector<size_t> &chain) {
  const CpuDivision division = divisionOf(groups_[group], guaranteed);
  const bool isRewritten = division != groups_[group].division;
  groups_[group].division = division;
  if (isRewritten) ++rewrites_;
  for (size_t index : groups_[group].children) {
    const bool isInChain = std::find(chain.begin(), chain.end(), index) != chain.end();
    if (!isRewritten && !isInChain) continue;
    Group &child = groups_[index];
    child.weight = cpuWeightOf(division, childOf(child));
    ++writes_;
    settleBelow(index, guaranteedPart(division, childOf(child)), chain);
  }
}

bool CpuTree::weighAll() {
  const auto host = weighHost();
  if (!host) return false;
  std::vector<MachinePart> guaranteed(groups_.size());
  guaranteed[kHost] = host->guaranteed;
  for (size_t index = 0; index < groups_.size(); ++index) {  // parents come before children
    Group &group = groups_[index];
    group.division = divisionOf(group, guaranteed[index]);
    for (size_t child : group.children) {
      groups_[child].weight = cpuWeightOf(group.division, childOf(groups_[child]));
      guaranteed[child] = guaranteedPart(group.division, childOf(groups_[child]));
    }
  }
  return true;
}

void CpuTree::calculateParts() {
  updateBusy(kHost);
  Group &host = groups_[kHost];
  const auto weight = static_cast<double>(host.weight);
  host.part = weight / (weight + static_cast<double>(othersWeight_));
  host.fair = host.part;
  calculateBelow(kHost);
}

bool CpuTree::updateBusy(size_t group) {
  if (groups_[group].children.empty()) return groups_[group].isBusy;
  bool isAnyBusy = false;
  for (size_t child : groups_[group].children) isAnyBusy = updateBusy(child) || isAnyBusy;
  return groups_[group].isBusy = isAnyBusy;
}

void CpuTree::calculateBelow(size_t group) {
  const Group &parent = groups_[group];
  double weights = 0, shares = 0;
  for (size_t child : parent.children) {
    if (groups_[child].isBusy) weights += static_cast<double>(groups_[child].weight);
    shares += static_cast<double>(groups_[child].shareWeight);
  }
  const double free = std::max(0.0, parent.fair - partOf(parent.childrenReservation));
  for (size_t index : parent.children) {
    Group &child = groups_[index];
    const auto weight = static_cast<double>(child.weight);
    child.part = child.isBusy ? parent.part * weight / weights : 0;
    child.fair = reserved(child) + free * static_cast<double>(child.shareWeight) / shares;
    calculateBelow(index);
  }
}

double CpuTree::hostAllowed() const {
  const double reservation = reserved(groups_[kHost]);
  const auto weight = static_cast<double>(groups_[kHost].shareWeight);
  return std::max(weight / (weight + static_cast<double>(othersWeight_)),
                  reservation + (1 - reservation) / 20);
}

double CpuTree::leastHostPart() const {
  return leastPart(kHost);
}

// No child has less than 1/10,000 of what the one with the greatest need has.
double CpuTree::leastPart(size_t group) const {
  const Group &parent = groups_[group];
  if (parent.childrenReservation == 0) return partOf(parent.min);
  std::vector<double> needs;
  for (size_t child : parent.children) needs.push_back(leastPart(child));
  const double least = *std::max_element(needs.begin(), needs.end()) / kMaxCpuWeight;
  double sum = 0;
  for (double need : needs) sum += std::max(need, least);
  return std::max(sum, partOf(parent.min));
}

}  // namespace Knob::Linux
