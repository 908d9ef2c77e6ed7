// SPDX-License-Identifier: Apache-2.0
// Reads a "!config" mapping and looks its field up in the configuration store.
#include "configref/config_reference.h"

#include <exception>
#include <memory>
#include <optional>
#include <string>

#include "calc/tagged_value.h"
#include "platform/kestrel_config_store.h"
#include "yaml/exception.h"
#include "yaml/node.h"

namespace {

using KestrelConfigStore::ConfigStore;
using KestrelConfigStore::ConfigStoreException;
using KestrelConfigStore::ConfigStoreObjectId;
using KestrelConfigStore::InvalidTypeException;
using KestrelConfigStore::StoreObject;
using Yaml::scalarText;

template <typename Value>
struct Reference {
  ConfigStoreObjectId id;
  std::string field;
  std::optional<Value> fallback;
  bool hasObject = false;
};

void readObjectSequence(const YAML::Node &node, ConfigStoreObjectId &id) {
  id.component = scalarText(node[0]);
  id.group = scalarText(node[1]);
  id.key = scalarText(node[2]);
}

void readObjectMapping(const YAML::Node &node, ConfigStoreObjectId &id) {
  for (const auto &entry : node) {
    const std::string name = scalarText(entry.first);
    if (name == "key") {
      id.key = scalarText(entry.second);
    } else if (name == "component") {
      id.component = scalarText(entry.second);
    } else if (name == "group") {
      id.group = scalarText(entry.second);
    } else {
      throw Loader::Exception(entry.first.Mark(), "invalid objectID field");
    }
  }
}

// Parts of the id that the node does not name stay as they are.
void readObject(const YAML::Node &node, ConfigStoreObjectId &id) {
  Yaml::requireValid(node);
  if (!node.IsDefined() || Yaml::isNull(node)) return;
  if (node.IsScalar()) {
    throw Loader::Exception(node.Mark(), "invalid config object specification");
  }
  if (node.IsSequence()) {
    readObjectSequence(node, id);
  } else {
    readObjectMapping(node, id);
  }
}

template <typename Value, typename Convert>
Reference<Value> readReference(const YAML::Node &node, Convert convertDefault) {
  Yaml::requireValid(node);
  if (!node.IsDefined() || !node.IsMap()) {
    throw Loader::Exception(node.Mark(), "invalid config specification");
  }
  Reference<Value> reference;
  for (const auto &entry : node) {
    const std::string name = scalarText(entry.first);
    if (name == "object") {
      readObject(entry.second, reference.id);
      reference.hasObject = true;
    } else if (name == "key") {
      reference.field = scalarText(entry.second);
    } else if (name == "default") {
      reference.fallback = convertDefault(entry.second);
    } else {
      throw Loader::Exception(entry.second.Mark(), "invalid config field");
    }
  }
  if (!reference.fallback) throw Loader::Exception(node.Mark(), "missing default");
  if (!reference.hasObject) throw Loader::Exception(node.Mark(), "missing object");
  if (reference.field.empty()) throw Loader::Exception(node.Mark(), "missing value");
  return reference;
}

std::optional<double> readReal(const StoreObject &object, const char *field) {
  double value = 0.0;
  if (!object.GetValue(field, &value)) return std::nullopt;
  return value;
}

std::optional<double> readField(const StoreObject &object, const char *field) {
  try {
    long value = 0;
    if (!object.GetValue(field, &value)) return std::nullopt;
    return static_cast<double>(value);
  } catch (const InvalidTypeException &) {
    return readReal(object, field);
  }
}

// Empty if the default is to be used. A failing store counts as one without the value, so that a
// host gets its pools without it. Any other failure is an error with the place of the reference.
std::optional<double> lookUp(const YAML::Node &node, const ConfigStoreObjectId &id,
                             const std::string &field) {
  try {
    const std::shared_ptr<ConfigStore> store =
        ConfigStore::GetStore(KestrelConfigStore::sGlobalNamespace);
    if (!store) return std::nullopt;
    const std::shared_ptr<StoreObject> object = store->GetObject(id);
    if (!object) return std::nullopt;
    return readField(*object, field.c_str());
  } catch (const ConfigStoreException &) {
    return std::nullopt;
  } catch (const std::exception &failure) {
    std::throw_with_nested(Loader::Exception(node.Mark(), failure.what()));
  }
}

}  // namespace

float ConfigToFloat(const YAML::Node &node, const Calc::VariableTable &facts) {
  const auto reference = readReference<float>(
      node, [&facts](const YAML::Node &value) { return NodeToFloat(value, facts); });
  const std::optional<double> stored = lookUp(node, reference.id, reference.field);
  return stored ? static_cast<float>(*stored) : *reference.fallback;
}

bool ConfigToBool(const YAML::Node &node, const Calc::VariableTable &facts) {
  const auto reference = readReference<bool>(
      node, [&facts](const YAML::Node &value) { return NodeToBool(value, facts); });
  const std::optional<double> stored = lookUp(node, reference.id, reference.field);
  return stored ? *stored != 0.0 : *reference.fallback;
}
