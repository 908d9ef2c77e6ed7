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

int64_t readMemory(const YAML::Node &value) {
  return truncateTo<int64_t>(NodeToFloat(value, hostFacts()));
}

int32_t readCpu(const YAML::Node &value) {
  return truncateTo<int32_t>(NodeToFloat(value, hostFacts()));
}

struct Field {
  const char *key;
  void (*read)(ResourcePoolImpl &pool, const YAML::Node &value);
};

// There is no key for the CPU's minLimit: it always keeps its default.
constexpr Field kFields[] = {
    {"name", [](auto &pool, auto &value) { pool.name = Yaml::scalarText(value); }},
    {"mem", [](auto &pool, auto &value) { pool.mem.min = pool.mem.max = readMemory(value); }},
    {"memMin", [](auto &pool, auto &value) { pool.mem.min = readMemory(value); }},
    {"memMax", [](auto &pool, auto &value) { pool.mem.max = readMemory(value); }},
    {"memMinLimit", [](auto &pool, auto &value) { pool.mem.minLimit = readMemory(value); }},
    {"memShares", [](auto &pool, auto &value) { pool.mem.shares = readMemory(value); }},
    {"cpuMin", [](auto &pool, auto &value) { pool.cpu.min = readCpu(value); }},
    {"cpuMax", [](auto &pool, auto &value) { pool.cpu.max = readCpu(value); }},
    {"cpuShares", [](auto &pool, auto &value) { pool.cpu.shares = readCpu(value); }},
    {"isEnabled", [](auto &pool, auto &value) { pool.isEnabled = NodeToBool(value, hostFacts()); }},
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

ResourcePoolImpl::ResourcePoolImpl(const YAML::Node &item) {
  mem.min = 0;
  mem.max = mem.shares = mem.minLimit = -1;
  cpu.min = 0;
  cpu.max = cpu.minLimit = -1;
  cpu.shares = 1000;
  (void)hostFacts();  // a kernel that does not answer is reported before anything in the item
  Yaml::requireValid(item);
  if (!item.IsMap()) throw Exception(item.Mark(), "expected a map");
  for (const auto &entry : item) {
    const Field *const field = findField(Yaml::scalarText(entry.first));
    if (field == nullptr) throw Exception(entry.first.Mark(), "invalid rp field");
    field->read(*this, entry.second);
  }
  if (name.empty()) throw Exception(item.Mark(), "rp missing name");
  name = groupPath(name);
}

}  // namespace Loader
