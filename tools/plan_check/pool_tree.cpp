// SPDX-License-Identifier: Apache-2.0
// Admission is libknob's; only the reasons of a refusal are worked out here.
#include "plan_check/pool_tree.h"

#include <algorithm>
#include <utility>

#include "knob/allocation.h"
#include "knob/names.h"

namespace Plan {
namespace {

using Knob::Resource;
using Knob::ResourceState;

// More holders than this hide the figures rather than explain them.
constexpr size_t kMaxHolders = 3;

std::string amount(int64_t number, Resource resource) {
  return std::to_string(number) + (resource == Resource::kMemory ? " MB" : " %");
}

std::string fixedChildPath() {
  return std::string(Knob::kRootName) + "/" + std::string(Knob::kFixedChildName);
}

// The smaller of both limits, where there is one.
std::optional<int64_t> limitOf(const Knob::Allocation &allocation) {
  if (allocation.max == -1 && allocation.minLimit == -1) return std::nullopt;
  if (allocation.max == -1) return allocation.minLimit;
  if (allocation.minLimit == -1) return allocation.max;
  return std::min(allocation.max, allocation.minLimit);
}

void addGroups(Knob::Kernel &kernel, Knob::GroupId id, const std::string &path,
               std::vector<KernelGroup> *groups) {
  try {
    KernelGroup group{path, kernel.view(id), kernel.members(id).size()};
    groups->push_back(std::move(group));
    std::map<std::string, Knob::GroupId> children;
    for (const Knob::GroupId child : kernel.childGroups(id)) {
      try {
        children.emplace(kernel.view(child).name, child);
      } catch (const Knob::KernelError &error) {
        if (error.status != Knob::Status::kNotFound) throw;
      }
    }
    for (const auto &[name, child] : children) {
      addGroups(kernel, child, path + "/" + name, groups);
    }
  } catch (const Knob::KernelError &error) {
    if (error.status != Knob::Status::kNotFound) throw;
  }
}

}  // namespace

std::vector<KernelGroup> readGroups(Knob::Kernel &kernel) {
  std::vector<KernelGroup> groups;
  const std::string root(Knob::kRootName);
  addGroups(kernel, kernel.lookUp(root), root, &groups);
  return groups;
}

std::string parentOf(const std::string &path) {
  const size_t slash = path.rfind('/');
  return slash == std::string::npos ? std::string() : path.substr(0, slash);
}

PoolTree::PoolTree(int64_t memoryMB, int64_t cpuPercent)
    : memoryMB_(memoryMB), cpuPercent_(cpuPercent) {
  groups_[std::string(Knob::kRootName)];
  groups_[fixedChildPath()];
}

PoolTree::PoolTree(int64_t memoryMB, int64_t cpuPercent, const std::vector<KernelGroup> &groups)
    : PoolTree(memoryMB, cpuPercent) {
  for (const KernelGroup &group : groups) {
    groups_[group.path].memory.allocation = group.view.memory;
    groups_[group.path].cpu.allocation = group.view.cpu;
  }
  // Children come behind their parents, so the way back finds each sum complete.
  for (auto group = groups_.rbegin(); group != groups_.rend(); ++group) {
    addToParents(group->first);
  }
}

void PoolTree::addToParents(const std::string &path) {
  const auto parent = groups_.find(parentOf(path));
  if (parent == groups_.end()) return;
  const Group &group = groups_.at(path);
  parent->second.memory.childrenSum += Knob::reservationOf(group.memory);
  parent->second.cpu.childrenSum += Knob::reservationOf(group.cpu);
}

bool PoolTree::hasChildren(const std::string &path) const {
  const auto next = groups_.lower_bound(path + "/");
  return next != groups_.end() && next->first.compare(0, path.size() + 1, path + "/") == 0;
}

const Knob::Allocation &PoolTree::allocation(const std::string &path, Resource resource) const {
  return state(path, resource).allocation;
}

ResourceState &PoolTree::state(const std::string &path, Resource resource) {
  Group &group = groups_.at(path);
  return resource == Resource::kMemory ? group.memory : group.cpu;
}

const ResourceState &PoolTree::state(const std::string &path, Resource resource) const {
  const Group &group = groups_.at(path);
  return resource == Resource::kMemory ? group.memory : group.cpu;
}

void PoolTree::create(const std::string &path) {
  groups_[path];
}

void PoolTree::remove(const std::string &path) {
  for (const Resource resource : {Resource::kMemory, Resource::kCpu}) {
    apply(path, resource, Knob::Allocation());
  }
  groups_.erase(path);
}

std::optional<std::string> PoolTree::set(const std::string &path, Resource resource,
                                         const Knob::AllocationChange &change) {
  std::vector<ResourceState> states;
  for (std::string at = path; !at.empty(); at = parentOf(at)) {
    states.push_back(state(at, resource));
  }
  Knob::Allocation wanted;
  try {
    wanted = Knob::changedAllocation(states.front().allocation, change);
  } catch (const Knob::KernelError &error) {
    return std::string(error.what());
  }
  const int64_t capacity = resource == Resource::kMemory ? memoryMB_ : cpuPercent_;
  if (!Knob::admit(std::move(states), wanted, capacity)) return whyNoRoom(path, resource, wanted);
  apply(path, resource, wanted);
  return std::nullopt;
}

// Stores the allocation and the ancestors' new sums.
void PoolTree::apply(const std::string &path, Resource resource, const Knob::Allocation &wanted) {
  ResourceState *changed = &state(path, resource);
  int64_t before = Knob::reservationOf(*changed);
  changed->allocation = wanted;
  int64_t after = Knob::reservationOf(*changed);
  for (std::string at = parentOf(path); !at.empty() && before != after; at = parentOf(at)) {
    ResourceState &above = state(at, resource);
    const int64_t aboveBefore = Knob::reservationOf(above);
    above.childrenSum += after - before;
    before = aboveBefore;
    after = Knob::reservationOf(above);
  }
}

std::string PoolTree::whyNoRoom(const std::string &path, Resource resource,
                                const Knob::Allocation &wanted) const {
  ResourceState own = state(path, resource);
  own.allocation = wanted;
  int64_t before = Knob::reservationOf(state(path, resource));
  int64_t after = Knob::reservationOf(own);
  const int64_t asked = after;
  const std::optional<int64_t> ownLimit = limitOf(wanted);
  if (ownLimit && after > *ownLimit) {
    return "reserves " + amount(after, resource) + ", above its own limit of " +
           amount(*ownLimit, resource);
  }
  std::string child = path;
  for (std::string at = parentOf(path); !at.empty(); at = parentOf(at)) {
    ResourceState above = state(at, resource);
    const int64_t aboveBefore = Knob::reservationOf(above);
    const int64_t others = above.childrenSum - before;
    above.childrenSum += after - before;
    const std::optional<int64_t> limit = limitOf(above.allocation);
    if (limit && Knob::reservationOf(above) > *limit) {
      return "asked: " + amount(asked, resource) + "; free in " + at + ": " +
             amount(std::max<int64_t>(*limit - others, 0), resource) + " of " +
             amount(*limit, resource) + holders(at, child, resource);
    }
    before = aboveBefore;
    after = Knob::reservationOf(above);
    child = at;
  }
  const int64_t capacity = resource == Resource::kMemory ? memoryMB_ : cpuPercent_;
  const std::string top = parentOf(path).empty() ? path : path.substr(0, path.find('/'));
  const int64_t rest = state(top, resource).childrenSum;
  return "asked: " + amount(asked, resource) + "; the machine has " + amount(capacity, resource) +
         ", of which " + amount(std::max<int64_t>(capacity - rest, 0), resource) + " are free" +
         holders("", path, resource);
}

// Who reserves most, below the parent or, without one, anywhere.
std::string PoolTree::holders(const std::string &parent, const std::string &except,
                              Resource resource) const {
  std::vector<std::pair<int64_t, std::string>> all;
  for (const auto &[path, group] : groups_) {
    const bool fixed = path == Knob::kRootName || path == fixedChildPath();
    const bool counts = parent.empty() ? !fixed : parentOf(path) == parent;
    const int64_t reserved = Knob::reservationOf(state(path, resource));
    if (counts && path != except && reserved > 0 && (!parent.empty() || !hasChildren(path))) {
      all.emplace_back(reserved, path);
    }
  }
  std::sort(all.rbegin(), all.rend());
  std::string text;
  for (size_t i = 0; i < std::min(all.size(), kMaxHolders); ++i) {
    text += (i == 0 ? "; held by " : ", ") + all[i].second + " (" + amount(all[i].first, resource) +
            ")";
  }
  if (all.size() > kMaxHolders) {
    text += " and " + std::to_string(all.size() - kMaxHolders) + " others";
  }
  return text;
}

}  // namespace Plan
