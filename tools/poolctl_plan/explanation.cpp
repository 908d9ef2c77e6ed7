// SPDX-License-Identifier: Apache-2.0
// Values come from the loader's own conversions; the second reader of expressions shows the parts.
#include "poolctl_plan/explanation.h"

#include <algorithm>
#include <exception>
#include <memory>
#include <nlohmann/json.hpp>
#include <optional>
#include <set>

#include "calc/tagged_value.h"
#include "plan_check/expression.h"
#include "platform/kestrel_config_store.h"
#include "shared/text.h"
#include "yaml/node.h"

namespace Plan {
namespace {

// An expression of more parts than this is not read by anyone.
constexpr size_t kMaxSteps = 40;

// Through an alias a value can be its own part.
constexpr int kMaxDepth = 8;

struct Found {
  std::string origin;
  std::vector<std::string> steps;
};

class Explainer {
 public:
  Explainer(const Calc::VariableTable &variables, std::string machineName)
      : variables_(variables), machineName_(std::move(machineName)) {}

  Found explainValue(const YAML::Node &node, int depth) {
    const std::string tag = Yaml::tagOf(node);
    if (depth > kMaxDepth) return {"a value inside other values", {}};
    if (tag == "!config") return explainReference(node, depth);
    if (tag != "!calc") return {"plain", {}};
    if (node.IsScalar()) return explainExpression(node.Scalar(), variables_, {});
    return explainMapping(node, depth);
  }

 private:
  Found explainMapping(const YAML::Node &node, int depth) {
    Calc::VariableTable local = variables_;
    std::set<std::string> defined;
    std::vector<std::string> steps;
    std::string result;
    for (const auto &entry : node) {
      const std::string name = entry.first.Scalar();
      if (name != "=") {
        local[name] = NodeToFloat(entry.second, variables_);
        defined.insert(name);
        const Found found = explainValue(entry.second, depth + 1);
        steps.insert(steps.end(), found.steps.begin(), found.steps.end());
        steps.push_back(name + " = " + numberText(local[name]) + " (defined here, " + found.origin +
                        ")");
      }
      result = entry.second.Scalar();
    }
    Found found = explainExpression(result, local, defined);
    found.steps.insert(found.steps.begin(), steps.begin(), steps.end());
    return found;
  }

  Found explainExpression(const std::string &text, const Calc::VariableTable &variables,
                          const std::set<std::string> &defined) const {
    const std::optional<Expression> read = readExpression(text, variables);
    if (!read) return {"= " + text, {}};
    Found found{"= " + bracketed(*read), {}};
    addSteps(*read, defined, &found.steps, true);
    return found;
  }

  void addSteps(const Expression &part, const std::set<std::string> &defined,
                std::vector<std::string> *steps, bool whole) const {
    for (const Expression &inner : part.parts) addSteps(inner, defined, steps, false);
    const bool variable = part.kind == Expression::Kind::kVariable;
    const bool skipped = part.kind == Expression::Kind::kNumber || (whole && !variable) ||
                         (variable && defined.count(part.text) > 0) || steps->size() >= kMaxSteps;
    if (skipped) return;
    std::string line = bracketed(part) + " = " + numberText(part.value);
    if (variable) line += " (" + machineName_ + ")";
    if (std::find(steps->begin(), steps->end(), line) == steps->end()) steps->push_back(line);
  }

  Found explainReference(const YAML::Node &node, int depth) {
    KestrelConfigStore::ConfigStoreObjectId id;
    std::string field;
    Found fallback;
    for (const auto &entry : node) {
      const std::string name = entry.first.Scalar();
      if (name == "object") readObject(entry.second, &id);
      if (name == "key") field = entry.second.Scalar();
      if (name == "default") fallback = explainValue(entry.second, depth + 1);
    }
    const std::string what =
        "object " + id.component + " " + id.group + " " + id.key + ", field " + field;
    const std::string problem = whyDefault(id, field);
    if (problem.empty()) return {"from the store: " + what, {}};
    fallback.origin = "the default (" + fallback.origin + "): " + problem + ": " + what;
    return fallback;
  }

  static void readObject(const YAML::Node &node, KestrelConfigStore::ConfigStoreObjectId *id) {
    if (node.IsSequence()) {
      id->component = node[0].Scalar();
      id->group = node[1].Scalar();
      id->key = node[2].Scalar();
    } else if (node.IsMap()) {
      for (const auto &entry : node) {
        const std::string name = entry.first.Scalar();
        if (name == "component") id->component = entry.second.Scalar();
        if (name == "group") id->group = entry.second.Scalar();
        if (name == "key") id->key = entry.second.Scalar();
      }
    }
  }

  // Empty when the store has the value.
  static std::string whyDefault(const KestrelConfigStore::ConfigStoreObjectId &id,
                                const std::string &field) {
    using namespace KestrelConfigStore;
    try {
      const auto store = ConfigStore::GetStore(sGlobalNamespace);
      if (!store) return "there is no store";
      const auto object = store->GetObject(id);
      if (!object) return "the store has no such object";
      long integer = 0;
      double real = 0;
      try {
        return object->GetValue(field.c_str(), &integer) ? "" : "the object has no such field";
      } catch (const InvalidTypeException &) {
        return object->GetValue(field.c_str(), &real) ? "" : "the object has no such field";
      }
    } catch (const InvalidTypeException &) {
      return "the field is not a number";
    } catch (const std::exception &error) {
      return std::string("the store cannot be read (") + error.what() + ")";
    }
  }

  const Calc::VariableTable &variables_;
  const std::string machineName_;
};

struct Key {
  const char *name;
  const char *other;  // a key that sets this value too
  int64_t (*value)(const Loader::ResourcePoolImpl &pool);
};

constexpr Key kKeys[] = {
    {"isEnabled", "", [](auto &pool) { return int64_t{pool.isEnabled}; }},
    {"memMin", "mem", [](auto &pool) { return int64_t{pool.mem.min}; }},
    {"memMax", "mem", [](auto &pool) { return int64_t{pool.mem.max}; }},
    {"memMinLimit", "", [](auto &pool) { return int64_t{pool.mem.minLimit}; }},
    {"memShares", "", [](auto &pool) { return int64_t{pool.mem.shares}; }},
    {"cpuMin", "", [](auto &pool) { return int64_t{pool.cpu.min}; }},
    {"cpuMax", "", [](auto &pool) { return int64_t{pool.cpu.max}; }},
    {"cpuShares", "", [](auto &pool) { return int64_t{pool.cpu.shares}; }},
};

// The key that gave the value: of two, the later one. Null: neither is given.
const char *givenBy(const DeclaredPool &pool, const Key &key) {
  const auto own = pool.keyPlaces.find(key.name);
  const auto other = pool.keyPlaces.find(key.other);
  if (other == pool.keyPlaces.end()) return own == pool.keyPlaces.end() ? nullptr : key.name;
  if (own == pool.keyPlaces.end()) return key.other;
  const bool ownIsLater = std::pair(own->second.line, own->second.column) >
                          std::pair(other->second.line, other->second.column);
  return ownIsLater ? key.name : key.other;
}

std::string valueText(const Key &key, const Loader::ResourcePoolImpl &pool) {
  const int64_t value = key.value(pool);
  if (std::string(key.name) == "isEnabled") return value != 0 ? "true" : "false";
  return std::to_string(value);
}

}  // namespace

std::vector<Explanation> explain(const DeclaredPool &pool, const std::string &key,
                                 const Machine &machine, const std::string &machineName) {
  Explainer explainer(machine.facts, machineName);
  std::vector<Explanation> list;
  for (const Key &row : kKeys) {
    const bool wanted = key.empty() || key == row.name || (!key.empty() && key == row.other);
    if (!wanted) continue;
    Explanation explanation;
    explanation.pool = pool.pool->name;
    explanation.key = row.name;
    explanation.value = valueText(row, *pool.pool);
    const char *const source = givenBy(pool, row);
    if (source == nullptr) {
      explanation.origin = "the default";
    } else {
      const Found found = explainer.explainValue(pool.values.at(source), 0);
      explanation.origin = found.origin;
      explanation.steps = found.steps;
      explanation.file = pool.file;
      explanation.place = placeOfKey(pool, source);
    }
    list.push_back(std::move(explanation));
  }
  return list;
}

std::string explanationText(const std::vector<Explanation> &explanations) {
  std::string text;
  std::string pool;
  for (const Explanation &explanation : explanations) {
    if (explanation.pool != pool) {
      pool = explanation.pool;
      text += (text.empty() ? "" : "\n") + Tools::printable(pool) + "\n";
    }
    const bool computed = explanation.origin.compare(0, 2, "= ") == 0;
    text += "  " + explanation.key + " " + explanation.value + (computed ? " " : ", ") +
            Tools::printable(explanation.origin);
    if (!explanation.file.empty()) {
      text += "  (" + Tools::printable(explanation.file) + ":" +
              std::to_string(explanation.place.line + 1) + ":" +
              std::to_string(explanation.place.column + 1) + ")";
    }
    text += "\n";
    for (const std::string &step : explanation.steps) {
      text += "    " + Tools::printable(step) + "\n";
    }
  }
  return text;
}

std::string explanationJson(const std::vector<Explanation> &explanations) {
  using Json = nlohmann::ordered_json;
  Json list = Json::array();
  for (const Explanation &explanation : explanations) {
    list.push_back({{"pool", explanation.pool},
                    {"key", explanation.key},
                    {"value", explanation.value},
                    {"origin", explanation.origin},
                    {"file", explanation.file},
                    {"line", explanation.place.line + 1},
                    {"column", explanation.place.line < 0 ? 0 : explanation.place.column + 1},
                    {"steps", explanation.steps}});
  }
  return Json({{"values", list}}).dump(2, ' ', false, Json::error_handler_t::replace) + "\n";
}

}  // namespace Plan
