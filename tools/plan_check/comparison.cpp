// SPDX-License-Identifier: Apache-2.0
// Comparing and laying out are separate functions, so that both can be used alone.
#include "plan_check/comparison.h"

#include <algorithm>
#include <array>
#include <map>
#include <nlohmann/json.hpp>
#include <set>

#include "plan_check/set_check.h"
#include "shared/text.h"

namespace Plan {
namespace {

using Kind = Difference::Kind;
using Knob::Resource;

bool isDefault(const Knob::Allocation &allocation) {
  const Knob::Allocation fresh;
  return allocation.min == fresh.min && allocation.max == fresh.max &&
         allocation.minLimit == fresh.minLimit && allocation.shares == fresh.shares;
}

bool isFixed(const std::string &path) {
  return path == "host" || path == "host/opt";
}

// A load makes the group, sets its memory, and then its CPU.
std::string whatIsUnset(const Loader::ResourcePoolImpl &pool, const Knob::GroupView &group) {
  const bool memoryDiffers = !differingSettings(pool, group, Resource::kMemory).empty();
  const bool cpuDiffers = !differingSettings(pool, group, Resource::kCpu).empty();
  if (!cpuDiffers || !isDefault(group.cpu)) return {};
  if (!memoryDiffers) return "the CPU is not set";
  return isDefault(group.memory) ? "neither memory nor CPU is set" : "";
}

void compareGroup(const Loader::ResourcePoolImpl &pool, const Knob::GroupView &group,
                  std::vector<Difference> *differences) {
  const std::string unset = whatIsUnset(pool, group);
  if (!unset.empty()) {
    differences->push_back({Kind::kHalfMade, pool.name, "", 0, 0, unset});
  } else {
    for (const Resource resource : {Resource::kMemory, Resource::kCpu}) {
      for (const Setting &setting : differingSettings(pool, group, resource)) {
        differences->push_back(
            {Kind::kValue, pool.name, setting.key, setting.declared, setting.kernel, ""});
      }
    }
  }
  if (!group.deviation.empty()) {
    differences->push_back({Kind::kFiles, pool.name, "", 0, 0, group.deviation});
  }
}

using Cells = std::array<std::string, 5>;

Cells cellsOf(const Difference &difference) {
  const std::string path = Tools::printable(difference.path);
  if (difference.kind == Kind::kValue) {
    return {nameOf(difference.kind), path, difference.key, std::to_string(difference.declared),
            std::to_string(difference.kernel)};
  }
  return {nameOf(difference.kind), path, Tools::printable(difference.text), "", ""};
}

}  // namespace

const char *nameOf(Kind kind) {
  switch (kind) {
    case Kind::kMissing:
      return "missing";
    case Kind::kNotDeclared:
      return "not declared";
    case Kind::kHalfMade:
      return "half made";
    case Kind::kValue:
      return "differs";
    case Kind::kFiles:
      return "control files";
  }
  return "";
}

std::vector<Setting> differingSettings(const Loader::ResourcePoolImpl &pool,
                                       const Knob::GroupView &group, Resource resource) {
  const bool memory = resource == Resource::kMemory;
  const Knob::AllocationChange wanted = memory ? memoryChange(pool) : cpuChange(pool);
  const Knob::Allocation &actual = memory ? group.memory : group.cpu;
  const std::string prefix = memory ? "mem" : "cpu";
  std::vector<Setting> settings = {
      {prefix + "Min", wanted.min == -1 ? 0 : *wanted.min, actual.min},
      {prefix + "Max", *wanted.max, actual.max},
      {prefix + "MinLimit", *wanted.minLimit, actual.minLimit},
  };
  if (wanted.shares) settings.push_back({prefix + "Shares", *wanted.shares, actual.shares});
  settings.erase(
      std::remove_if(settings.begin(), settings.end(),
                     [](const Setting &setting) { return setting.declared == setting.kernel; }),
      settings.end());
  return settings;
}

std::vector<Difference> compare(const std::vector<DeclaredPool> &pools,
                                const std::vector<KernelGroup> &groups, Undeclared undeclared) {
  std::map<std::string, const KernelGroup *> byPath;
  for (const KernelGroup &group : groups) byPath[group.path] = &group;
  std::vector<Difference> differences;
  std::set<std::string> declared;
  for (const DeclaredPool *const pool : inLoadOrder(pools)) {
    const std::string &path = pool->pool->name;
    const bool first = declared.insert(path).second;
    if (!first || !pool->pool->isEnabled || isFixed(path)) continue;
    const auto group = byPath.find(path);
    if (group == byPath.end()) {
      differences.push_back({Kind::kMissing, path, "", 0, 0, ""});
    } else {
      compareGroup(*pool->pool, group->second->view, &differences);
    }
  }
  for (const auto &[path, group] : byPath) {
    const bool report = undeclared == Undeclared::kReport && !isFixed(path);
    if (report && declared.count(path) == 0) {
      differences.push_back({Kind::kNotDeclared, path, "", 0, 0, ""});
    }
  }
  std::stable_sort(differences.begin(), differences.end(),
                   [](const Difference &a, const Difference &b) { return a.path < b.path; });
  return differences;
}

std::string differenceTable(const std::vector<Difference> &differences) {
  if (differences.empty()) return {};
  std::vector<Cells> rows = {{"STATE", "POOL", "KEY", "DECLARED", "KERNEL"}};
  for (const Difference &difference : differences) rows.push_back(cellsOf(difference));
  std::array<size_t, 5> widths{};
  for (const Cells &row : rows) {
    for (size_t i = 0; i < row.size(); ++i) {
      widths[i] = std::max(widths[i], Tools::displayWidth(row[i]));
    }
  }
  std::string text;
  for (const Cells &row : rows) {
    std::string line;
    for (size_t i = 0; i < row.size(); ++i) line += Tools::padded(row[i], widths[i]) + "  ";
    text += line.substr(0, line.find_last_not_of(' ') + 1) + "\n";
  }
  return text;
}

std::string differenceJson(const std::vector<Difference> &differences) {
  using Json = nlohmann::ordered_json;
  Json list = Json::array();
  for (const Difference &difference : differences) {
    Json entry = {{"state", nameOf(difference.kind)}, {"pool", difference.path}};
    if (difference.kind == Kind::kValue) {
      entry["key"] = difference.key;
      entry["declared"] = difference.declared;
      entry["kernel"] = difference.kernel;
    }
    if (!difference.text.empty()) entry["text"] = difference.text;
    list.push_back(std::move(entry));
  }
  return Json({{"differences", list}}).dump(2, ' ', false, Json::error_handler_t::replace) + "\n";
}

}  // namespace Plan
