// SPDX-License-Identifier: Apache-2.0
// Tries the steps on the model of the kernel until no further one fits.
#include "poolctl_plan/steps.h"

#include <algorithm>
#include <map>
#include <optional>
#include <set>
#include <utility>

#include "plan_check/set_check.h"

namespace Plan {
namespace {

using Act = Step::Act;
using Knob::Resource;

// Whether the step leaves no less room to other groups than there was.
bool makesRoom(const Step &step, const PoolTree &tree) {
  if (step.act == Act::kDelete) return true;
  if (step.act == Act::kCreate) return false;
  const Knob::AllocationChange &change =
      step.resource == Resource::kMemory ? step.memory : step.cpu;
  return std::max<int64_t>(*change.min, 0) <= tree.allocation(step.path, step.resource).min;
}

// Makes the step on the model, or returns why it does not fit; the model is as before then.
std::optional<std::string> tryStep(const Step &step, PoolTree *tree) {
  if (step.act == Act::kDelete) {
    if (tree->hasChildren(step.path)) return "it has child groups";
    tree->remove(step.path);
    return std::nullopt;
  }
  if (step.act == Act::kSet) {
    return tree->set(step.path, step.resource,
                     step.resource == Resource::kMemory ? step.memory : step.cpu);
  }
  const std::string parent = parentOf(step.path);
  if (!tree->has(parent)) return "there is no group " + parent;
  tree->create(step.path);
  auto refusal = tree->set(step.path, Resource::kMemory, step.memory);
  if (!refusal) refusal = tree->set(step.path, Resource::kCpu, step.cpu);
  if (refusal) tree->remove(step.path);
  return refusal;
}

class Planner {
 public:
  Planner(const std::vector<DeclaredPool> &pools, const Machine &machine,
          const std::vector<KernelGroup> &groups, Prune prune)
      : tree_(machine.memoryMB, machine.cpuPercent, groups), groups_(groups) {
    for (const KernelGroup &group : groups) byPath_[group.path] = &group;
    std::set<std::string> declared;
    for (const DeclaredPool *const pool : inLoadOrder(pools)) {
      const bool first = declared.insert(pool->pool->name).second;
      if (first && pool->pool->isEnabled) addPool(*pool->pool);
    }
    if (prune == Prune::kEmptyGroups) addDeletions(declared);
  }

  StepList plan() {
    sortPending();
    while (takeFitting()) {
    }
    for (const Step &step : pending_) {
      list_.obstacles.push_back({step.path, tryStep(step, &tree_).value_or("")});
    }
    return std::move(list_);
  }

 private:
  void addPool(const Loader::ResourcePoolImpl &pool) {
    if (pool.name == "host/opt") return;
    Step step;
    step.path = pool.name;
    step.memory = memoryChange(pool);
    step.cpu = cpuChange(pool);
    const auto group = byPath_.find(pool.name);
    if (group == byPath_.end()) {
      step.act = Act::kCreate;
      pending_.push_back(step);
      return;
    }
    for (const Resource resource : {Resource::kMemory, Resource::kCpu}) {
      step.resource = resource;
      step.settings = differingSettings(pool, group->second->view, resource);
      if (!step.settings.empty()) pending_.push_back(step);
    }
  }

  // A group stays when something lives in it, or when a group below it stays.
  void addDeletions(const std::set<std::string> &declared) {
    std::set<std::string> staying = {"host", "host/opt"};
    for (auto group = groups_.rbegin(); group != groups_.rend(); ++group) {
      const std::string &path = group->path;
      const bool undeclared = declared.count(path) == 0 && path != "host" && path != "host/opt";
      const bool holdsOthers = staying.count(path) > 0;
      if (undeclared && group->processes == 0 && !holdsOthers) {
        Step step;
        step.act = Act::kDelete;
        step.path = path;
        pending_.push_back(step);
        continue;
      }
      staying.insert(parentOf(path));
      if (undeclared) {
        list_.obstacles.push_back({path, holdsOthers
                                             ? "not deleted: groups below it stay"
                                             : "not deleted: " + std::to_string(group->processes) +
                                                   " processes live in it"});
      }
    }
  }

  // What makes room comes first, children before parents; then parents before children.
  void sortPending() {
    std::stable_sort(pending_.begin(), pending_.end(), [this](const Step &a, const Step &b) {
      const bool roomA = makesRoom(a, tree_);
      const bool roomB = makesRoom(b, tree_);
      if (roomA != roomB) return roomA;
      if (roomA && a.path != b.path) return a.path > b.path;
      return a.path < b.path;
    });
  }

  bool takeFitting() {
    std::vector<Step> left;
    const size_t before = pending_.size();
    for (Step &step : pending_) {
      if (tryStep(step, &tree_)) {
        left.push_back(std::move(step));
      } else {
        list_.steps.push_back(std::move(step));
      }
    }
    pending_ = std::move(left);
    return pending_.size() < before && !pending_.empty();
  }

  PoolTree tree_;
  const std::vector<KernelGroup> &groups_;
  std::map<std::string, const KernelGroup *> byPath_;
  std::vector<Step> pending_;
  StepList list_;
};

std::string given(const char *key, const std::optional<int64_t> &value) {
  return std::string(key) + " " + std::to_string(value.value_or(-1));
}

}  // namespace

std::string stepText(const Step &step) {
  if (step.act == Act::kDelete) return "delete " + step.path;
  if (step.act == Act::kCreate) {
    return "create " + step.path + ": " + given("memMin", step.memory.min) + ", " +
           given("memMax", step.memory.max) + ", " + given("cpuMin", step.cpu.min) + ", " +
           given("cpuMax", step.cpu.max);
  }
  std::string text = "set " + step.path + ":";
  for (size_t i = 0; i < step.settings.size(); ++i) {
    const Setting &setting = step.settings[i];
    text += (i == 0 ? " " : ", ") + setting.key + " " + std::to_string(setting.kernel) + " -> " +
            std::to_string(setting.declared);
  }
  return text;
}

StepList planSteps(const std::vector<DeclaredPool> &pools, const Machine &machine,
                   const std::vector<KernelGroup> &groups, Prune prune) {
  return Planner(pools, machine, groups, prune).plan();
}

}  // namespace Plan
