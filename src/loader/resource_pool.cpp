// SPDX-License-Identifier: Apache-2.0
// Fills a pool record from a YAML mapping: defaults, keys in the order of the document, the name.
#include "loader/resource_pool.h"

#include <cstdint>
#include <limits>

#include "calc/tagged_value.h"
#include "loader/host_facts.h"
#include "yaml/exception.h"
#include "yaml/node.h"

namespace Loader {
namespace {

// Truncates toward zero. What the target cannot hold, and NaN, gives its most negative value.
template <typename Integer>
Integer truncateTo(float value) {
  constexpr float kLowest = static_cast<float>(std::numeric_limits<Integer>::min());
  if (value >= kLowest && value < -kLowest) return static_cast<Integer>(value);
  return std::numeric_limits<Integer>::min();
}

using Facts = Calc::VariableTable;

int64_t readMemory(const YAML::Node &value, const Facts &facts) {
  return truncateTo<int64_t>(NodeToFloat(value, facts));
}

int32_t readCpu(const YAML::Node &value, const Facts &facts) {
  return truncateTo<int32_t>(NodeToFloat(value, facts));
}

struct Field {
  const char *key;
  void (*read)(ResourcePoolImpl &pool, const YAML::Node &value, const Facts &facts);
};

// There is no key for the CPU's minLimit: it always keeps its default.
constexpr Field kFields[] = {
    {"name", [](auto &pool, auto &value, auto &) { pool.name = Yaml::scalarText(value); }},
    {"mem", [](auto &pool, auto &value,
               auto &facts) { pool.mem.min = pool.mem.max = readMemory(value, facts); }},
    {"memMin",
     [](auto &pool, auto &value, auto &facts) { pool.mem.min = readMemory(value, facts); }},
    {"memMax",
     [](auto &pool, auto &value, auto &facts) { pool.mem.max = readMemory(value, facts); }},
    {"memMinLimit",
     [](auto &pool, auto &value, auto &facts) { pool.mem.minLimit = readMemory(value, facts); }},
    {"memShares",
     [](auto &pool, auto &value, auto &facts) { pool.mem.shares = readMemory(value, facts); }},
    {"cpuMin", [](auto &pool, auto &value, auto &facts) { pool.cpu.min = readCpu(value, facts); }},
    {"cpuMax", [](auto &pool, auto &value, auto &facts) { pool.cpu.max = readCpu(value, facts); }},
    {"cpuShares",
     [](auto &pool, auto &value, auto &facts) { pool.cpu.shares = readCpu(value, facts); }},
    {"isEnabled",
     [](auto &pool, auto &value, auto &facts) { pool.isEnabled = NodeToBool(value, facts); }},
};

const Field *findField(const std::string &key) {
  for (const Field &field : kFields) {
    if (key == field.key) return &field;
  }
  return nullptr;
}

std::string groupPath(const std::string &name) {
  return name.compare(0, 5, "host/") == 0 ? name : "host/opt/" + name;
}

}  // namespace

std::vector<std::string> poolKeys() {
  std::vector<std::string> keys;
  for (const Field &field : kFields) keys.emplace_back(field.key);
  return keys;
}

// A kernel whose facts cannot be read is reported before anything in the item.
ResourcePoolImpl::ResourcePoolImpl(const YAML::Node &item) : ResourcePoolImpl(item, hostFacts()) {}

ResourcePoolImpl::ResourcePoolImpl(const YAML::Node &item, const Calc::VariableTable &facts) {
  mem.min = 0;
  mem.max = mem.shares = mem.minLimit = -1;
  cpu.min = 0;
  cpu.max = cpu.minLimit = -1;
  cpu.shares = 1000;
  Yaml::requireValid(item);
  if (!item.IsMap()) throw Exception(item.Mark(), "expected a map");
  for (const auto &entry : item) {
    const Field *const field = findField(Yaml::scalarText(entry.first));
    if (field == nullptr) throw Exception(entry.first.Mark(), "invalid rp field");
    field->read(*this, entry.second, facts);
  }
  if (name.empty()) throw Exception(item.Mark(), "rp missing name");
  name = groupPath(name);
}

}  // namespace Loader
