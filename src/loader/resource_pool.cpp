// SPDX-License-Identifier: Apache-2.0
// Fills a pool record from a YAML mapping: defaults, then the keys in the order of the document,
// then the group path.
#include "loader/resource_pool.h"

#include <cstdint>
#include <limits>

#include "calc/tagged_value.h"
#include "loader/group_path.h"
#include "loader/host_facts.h"
#include "yaml/exception.h"
#include "yaml/node.h"

namespace Loader {
namespace {

// Truncates toward zero. A value out of range, or NaN, gives the most negative value.
template <typename Integer>
Integer truncateTo(float value) {
  constexpr float kLowest = static_cast<float>(std::numeric_limits<Integer>::min());
  if (value >= kLowest && value < -kLowest) return static_cast<Integer>(value);
  return std::numeric_limits<Integer>::min();
}

// The pool that is filled, and the facts that its values may use.
struct Reading {
  ResourcePoolImpl &pool;
  const Calc::VariableTable &facts;

  int64_t memory(const YAML::Node &value) const {
    return truncateTo<int64_t>(NodeToFloat(value, facts));
  }
  int32_t cpu(const YAML::Node &value) const {
    return truncateTo<int32_t>(NodeToFloat(value, facts));
  }
  bool flag(const YAML::Node &value) const { return NodeToBool(value, facts); }
};

struct Field {
  const char *key;
  void (*read)(const Reading &to, const YAML::Node &value);
};

// No key sets cpu.minLimit: it always keeps its default.
constexpr Field kFields[] = {
    {"name", [](auto &to, auto &value) { to.pool.name = Yaml::scalarText(value); }},
    {"mem", [](auto &to, auto &value) { to.pool.mem.min = to.pool.mem.max = to.memory(value); }},
    {"memMin", [](auto &to, auto &value) { to.pool.mem.min = to.memory(value); }},
    {"memMax", [](auto &to, auto &value) { to.pool.mem.max = to.memory(value); }},
    {"memMinLimit", [](auto &to, auto &value) { to.pool.mem.minLimit = to.memory(value); }},
    {"memShares", [](auto &to, auto &value) { to.pool.mem.shares = to.memory(value); }},
    {"cpuMin", [](auto &to, auto &value) { to.pool.cpu.min = to.cpu(value); }},
    {"cpuMax", [](auto &to, auto &value) { to.pool.cpu.max = to.cpu(value); }},
    {"cpuShares", [](auto &to, auto &value) { to.pool.cpu.shares = to.cpu(value); }},
    {"isEnabled", [](auto &to, auto &value) { to.pool.isEnabled = to.flag(value); }},
};

const Field *findField(const std::string &key) {
  for (const Field &field : kFields) {
    if (key == field.key) return &field;
  }
  return nullptr;
}

}  // namespace

std::vector<std::string> poolKeys() {
  std::vector<std::string> keys;
  for (const Field &field : kFields) keys.emplace_back(field.key);
  return keys;
}

// Reads the facts first: if that fails, it is the error even when the item is invalid too.
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
    field->read({*this, facts}, entry.second);
  }
  if (name.empty()) throw Exception(item.Mark(), "rp missing name");
  name = groupPath(name);
}

}  // namespace Loader
