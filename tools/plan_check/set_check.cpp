// SPDX-License-Identifier: Apache-2.0
// Plays a load on a model of the kernel: first as on a machine that has just started, with the
// groups that no definition declares; then on the groups as they are.
#include "plan_check/set_check.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <map>
#include <set>
#include <utility>

#include "calc/tagged_value.h"
#include "knob/names.h"

namespace Plan {
namespace {

using Knob::Resource;
using Loader::ResourcePoolImpl;

constexpr int64_t kNotGiven = -1;
constexpr int64_t kHighShares = -4;

// No process can live in less.
constexpr int64_t kMinUsefulMB = 4;

// No machine has this many MB, but many have as many KB or bytes.
constexpr int64_t kSuspiciousMB = 1048576;

// Someone who writes less has most likely counted CPUs.
constexpr int32_t kMinUsefulPercent = 5;

class SetCheck {
 public:
  SetCheck(const std::vector<DeclaredPool> &pools, const Machine &machine,
           const std::optional<std::vector<KernelGroup>> &groups)
      : pools_(inLoadOrder(pools)), machine_(machine), groups_(groups) {
    for (const DeclaredPool *declared : pools_) byPath_.emplace(path(*declared), declared);
  }

  enum class Also { kNothing, kGroupsAsTheyAre };

  Findings run(Also also) {
    checkDuplicates();
    for (const DeclaredPool *declared : pools_) {
      checkEmpty(*declared);
      if (machine_.isKnown) checkValues(*declared);
    }
    checkLoad(afterStart(), "");
    if (also == Also::kGroupsAsTheyAre && groups_ && machine_.isKnown) {
      checkLoad(asItIs(), " with the groups as they are now");
    }
    return std::move(findings_);
  }

 private:
  static const std::string &path(const DeclaredPool &declared) { return declared.pool->name; }

  void add(Severity severity, const DeclaredPool &declared, const std::string &key,
           const std::string &code, const std::string &message, const std::string &advice = "") {
    findings_.push_back({severity, code, declared.file, placeOfKey(declared, key), path(declared),
                         message, "", advice, severity == Severity::kError});
  }

  // An error, but for a pool that load leaves out.
  void refuse(const DeclaredPool &declared, const std::string &key, const std::string &code,
              const std::string &message, const std::string &advice = "") {
    refused_.insert(path(declared));
    add(declared.pool->isEnabled ? Severity::kError : Severity::kWarning, declared, key, code,
        message, advice);
  }

  void checkDuplicates() {
    for (const DeclaredPool *declared : pools_) {
      const DeclaredPool &first = *byPath_.at(path(*declared));
      if (&first == declared) continue;
      add(Severity::kWarning, *declared, "name", "pool-twice",
          path(first) + " is declared twice, first at " + first.file + ":" +
              std::to_string(placeOfKey(first, "name").line + 1),
          "load makes one of them and skips the other: remove one");
    }
  }

  // A pool that only holds others needs no values.
  void checkEmpty(const DeclaredPool &declared) {
    if (declared.values.size() != 1) return;
    const std::string below = path(declared) + "/";
    const auto child = byPath_.lower_bound(below);
    const bool isParent =
        child != byPath_.end() && child->first.compare(0, below.size(), below) == 0;
    if (isParent) return;
    add(Severity::kWarning, declared, "name", "no-values",
        "nothing is set: the pool neither reserves nor limits anything");
  }

  void checkValues(const DeclaredPool &declared) {
    const ResourcePoolImpl &pool = *declared.pool;
    for (const auto &[key, node] : declared.values) {
      if (key == "name") continue;
      if (key == "isEnabled") {
        checkTruth(declared, node);
      } else {
        checkNumber(declared, key, NodeToFloat(node, machine_.facts));
      }
    }
    checkOrder(declared, pool.mem.min, pool.mem.max, "memMin", "memMax");
    checkOrder(declared, pool.cpu.min, pool.cpu.max, "cpuMin", "cpuMax");
    checkMemory(declared);
    const bool fewPercent = pool.cpu.max >= 0 && pool.cpu.max < kMinUsefulPercent;
    if (fewPercent && declared.values.count("cpuMax") > 0) {
      add(Severity::kWarning, declared, "cpuMax", "unit-cpu",
          "cpuMax is " + std::to_string(pool.cpu.max) + " percent of one CPU",
          "100 is one CPU; leave the key out where there is no limit");
    }
  }

  void checkTruth(const DeclaredPool &declared, const YAML::Node &node) {
    if (node.Tag() != "!calc") return;
    if (!std::isnan(NodeToFloat(node, machine_.facts))) return;
    add(Severity::kWarning, declared, "isEnabled", "not-finite",
        "the value is not a number, which counts as true");
  }

  void checkNumber(const DeclaredPool &declared, const std::string &key, float value) {
    const bool shares = key == "memShares" || key == "cpuShares";
    const bool cpu = key.compare(0, 3, "cpu") == 0;
    const float end = cpu ? 2147483648.0F : 9223372036854775808.0F;
    if (!std::isfinite(value) || value >= end || value < -end) {
      const std::string what = std::isnan(value)   ? "not a number"
                               : std::isinf(value) ? "infinite"
                                                   : "too large";
      refuse(declared, key, "not-finite", key + " is " + what,
             "leave the key out where there is no limit");
      return;
    }
    const auto whole = static_cast<int64_t>(value);
    const bool level = shares && whole >= kHighShares;
    if (whole < kNotGiven && !level) {
      refuse(declared, key, "negative", key + " is " + std::to_string(whole) + ", below 0",
             shares ? "" : "-1 means that it is not given");
    } else if (value < 0 && whole == 0) {
      add(Severity::kWarning, declared, key, "negative",
          key + " is negative, and becomes 0 because the fraction is cut off");
    }
  }

  void checkOrder(const DeclaredPool &declared, int64_t min, int64_t max, const char *minKey,
                  const char *maxKey) {
    if (min < 0 || max < 0 || min <= max) return;
    refuse(declared, declared.values.count(minKey) > 0 ? minKey : maxKey, "min-above-max",
           std::string(minKey) + " " + std::to_string(min) + " is above " + maxKey + " " +
               std::to_string(max));
  }

  void checkMemory(const DeclaredPool &declared) {
    const ResourcePoolImpl &pool = *declared.pool;
    if (pool.mem.max >= 0 && pool.mem.max < kMinUsefulMB) {
      add(Severity::kWarning, declared, keyOf(declared, "memMax"), "small",
          "the maximum is " + std::to_string(pool.mem.max) + " MB: no process can live in it",
          "memory is in MB");
    }
    for (const char *const key : {"memMin", "memMax"}) {
      const bool isMin = std::string(key) == "memMin";
      const int64_t value = isMin ? pool.mem.min : pool.mem.max;
      if (value < kSuspiciousMB || value <= machine_.memoryMB || hasTwin(declared, key)) continue;
      add(Severity::kWarning, declared, keyOf(declared, key), "bytes",
          std::to_string(value) + " MB is more than the machine has: is it in bytes or KB?",
          "memory is in MB");
    }
    checkGap(declared);
  }

  // Of "mem", which sets both, one finding is enough.
  static bool hasTwin(const DeclaredPool &declared, const std::string &key) {
    return key == "memMax" && declared.values.count("memMax") == 0 &&
           declared.values.count("mem") > 0;
  }

  static std::string keyOf(const DeclaredPool &declared, const std::string &key) {
    return declared.values.count(key) > 0 ? key : "mem";
  }

  // Page cache of the parent's own can then make the kernel kill processes in the pool.
  void checkGap(const DeclaredPool &declared) {
    const ResourcePoolImpl &pool = *declared.pool;
    if (pool.mem.max <= 0 || pool.mem.min != pool.mem.max) return;
    const auto parent = byPath_.find(parentOf(path(declared)));
    if (parent == byPath_.end()) return;
    const int64_t room = parent->second->pool->mem.max;
    if (room < 0 || room > pool.mem.max) return;
    add(Severity::kWarning, declared, keyOf(declared, "memMin"), "no-gap",
        "minimum and maximum are " + std::to_string(pool.mem.max) + " MB, and " + parent->first +
            " has no more than that: processes that read files can be killed",
        "leave a gap between memMin and memMax");
  }

  // Without the groups that the definitions declare: load makes those.
  PoolTree afterStart() const {
    std::vector<KernelGroup> others;
    for (const KernelGroup &group : groups_.value_or(std::vector<KernelGroup>())) {
      if (byPath_.count(group.path) == 0) others.push_back(group);
    }
    return PoolTree(machine_.memoryMB, machine_.cpuPercent, others);
  }

  PoolTree asItIs() const { return {machine_.memoryMB, machine_.cpuPercent, *groups_}; }

  void checkLoad(PoolTree tree, const std::string &when) {
    for (const auto &[path, declared] : byPath_) {
      if (!declared->pool->isEnabled || tree.has(path) || !Knob::splitPath(path)) continue;
      const std::string parent = parentOf(path);
      if (!tree.has(parent)) {
        missingParent(*declared, parent, when);
        continue;
      }
      tree.create(path);
      if (!machine_.isKnown || refused_.count(path) > 0) continue;
      allocate(&tree, *declared, when);
    }
  }

  void missingParent(const DeclaredPool &declared, const std::string &parent,
                     const std::string &when) {
    const auto known = byPath_.find(parent);
    const bool reported = refused_.count(parent) > 0 || refused_.count(path(declared)) > 0;
    const bool possible = !groups_ && (known == byPath_.end() || known->second->pool->isEnabled);
    if (reported || possible) {
      refused_.insert(path(declared));
      return;
    }
    const bool disabled = known != byPath_.end() && !known->second->pool->isEnabled;
    refuse(declared, "name", "no-parent",
           disabled
               ? "the parent " + parent + " is not enabled, so that load does not make it" + when
               : "the parent " + parent + " is neither declared nor in the kernel",
           disabled ? "" : "declare it as a pool of its own, or correct the name");
  }

  void allocate(PoolTree *tree, const DeclaredPool &declared, const std::string &when) {
    const ResourcePoolImpl &pool = *declared.pool;
    const auto memory = tree->set(pool.name, Resource::kMemory, memoryChange(pool));
    if (memory) {
      refuse(declared, keyOf(declared, "memMin"), codeOf(when),
             "the memory does not fit" + when + ": " + *memory);
      return;
    }
    const auto cpu = tree->set(pool.name, Resource::kCpu, cpuChange(pool));
    if (cpu) {
      refuse(declared, "cpuMin", codeOf(when), "the CPU does not fit" + when + ": " + *cpu);
    }
  }

  // A set that only the present groups leave no room for can be applied, though not loaded.
  static std::string codeOf(const std::string &when) {
    return when.empty() ? "no-room" : "no-room-now";
  }

  const std::vector<const DeclaredPool *> pools_;
  const Machine &machine_;
  const std::optional<std::vector<KernelGroup>> &groups_;
  std::map<std::string, const DeclaredPool *> byPath_;  // the first of each name
  std::set<std::string> refused_;                       // each is reported once
  Findings findings_;
};

template <typename Allocation>
Knob::AllocationChange changeOf(const Allocation &allocation) {
  Knob::AllocationChange change;
  change.min = allocation.min;
  change.max = allocation.max;
  change.minLimit = allocation.minLimit;
  if (allocation.shares != kNotGiven) change.shares = allocation.shares;
  return change;
}

}  // namespace

Knob::AllocationChange memoryChange(const ResourcePoolImpl &pool) {
  return changeOf(pool.mem);
}

Knob::AllocationChange cpuChange(const ResourcePoolImpl &pool) {
  return changeOf(pool.cpu);
}

std::vector<const DeclaredPool *> inLoadOrder(const std::vector<DeclaredPool> &pools) {
  std::vector<const DeclaredPool *> sorted;
  for (const DeclaredPool &declared : pools) sorted.push_back(&declared);
  std::stable_sort(sorted.begin(), sorted.end(),
                   [](const auto *a, const auto *b) { return a->pool->name < b->pool->name; });
  return sorted;
}

Findings checkSet(const std::vector<DeclaredPool> &pools, const Machine &machine,
                  const std::optional<std::vector<KernelGroup>> &groups) {
  return SetCheck(pools, machine, groups).run(SetCheck::Also::kGroupsAsTheyAre);
}

Findings checkSetAfterStart(const std::vector<DeclaredPool> &pools, const Machine &machine,
                            const std::vector<KernelGroup> &groups) {
  const std::optional<std::vector<KernelGroup>> known = groups;
  return SetCheck(pools, machine, known).run(SetCheck::Also::kNothing);
}

}  // namespace Plan
