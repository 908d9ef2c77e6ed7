// SPDX-License-Identifier: Apache-2.0
// A libkestrelconfig for tests: it records every lookup and takes the result from a script: a
// value, nothing, or an exception. README.md in this folder describes its files.
#include <cstdlib>
#include <fstream>
#include <iostream>
#include <map>
#include <sstream>
#include <stdexcept>

#include "platform/kestrel_config_store.h"
#include "trace.h"

namespace KestrelConfigStore {
namespace {

using Recording::quoted;

void write(const std::string &line) {
  Recording::record("SCRIPTED_CONFIG_TRACE", line);
}

struct Result {
  std::string kind, text;  // integer, real, text, or an exception and its message
};

void throwIfAsked(const Result &result) {
  if (result.kind == "ConfigStoreException") throw ConfigStoreException(result.text);
  if (result.kind == "InvalidTypeException") throw InvalidTypeException(result.text);
  if (result.kind == "runtime_error") throw std::runtime_error(result.text);
}

// The scripted results, by "store", "object ID" and "field ID NAME".
using Script = std::map<std::string, Result>;

const Script &script() {
  static const Script only = [] {
    Script made;
    const char *path = getenv("SCRIPTED_CONFIG_SCRIPT");
    if (path == nullptr) return made;
    std::ifstream file(path);
    for (std::string line; std::getline(file, line);) {
      const size_t sign = line.find(" = ");
      if (sign == std::string::npos) {
        std::cerr << "scripted libkestrelconfig: no \" = \": " << line << std::endl;
        abort();
      }
      std::istringstream words(line.substr(sign + 3));
      Result result;
      words >> result.kind;
      std::getline(words >> std::ws, result.text);
      made[line.substr(0, sign)] = result;
    }
    return made;
  }();
  return only;
}

const Result *scripted(const std::string &what) {
  const auto found = script().find(what);
  return found == script().end() ? nullptr : &found->second;
}

class ScriptedObject : public StoreObject {
 public:
  explicit ScriptedObject(std::string id) : id_(std::move(id)) {}

  bool GetValue(const char *field, long *value) const override {
    const Result *result = read("long", field);
    if (result == nullptr) return false;
    if (result->kind != "integer") throw InvalidTypeException("no integer");
    *value = std::stol(result->text);
    return true;
  }

  bool GetValue(const char *field, double *value) const override {
    const Result *result = read("double", field);
    if (result == nullptr) return false;
    if (result->kind == "text") throw InvalidTypeException("no number");
    *value = std::stod(result->text);
    return true;
  }

 private:
  const Result *read(const char *type, const char *field) const {
    write(std::string("GetValue ") + type + " " + quoted(field));
    const Result *result = scripted("field " + id_ + " " + field);
    if (result != nullptr) throwIfAsked(*result);
    return result;
  }

  const std::string id_;
};

class ScriptedStore : public ConfigStore {
 public:
  std::shared_ptr<StoreObject> GetObject(const ConfigStoreObjectId &id) override {
    write("GetObject key=" + quoted(id.key) + " component=" + quoted(id.component) +
          " group=" + quoted(id.group) + " extra=" + quoted(id.extra));
    const std::string whole = id.component + "/" + id.group + "/" + id.key;
    const Result *result = scripted("object " + whole);
    if (result == nullptr) return nullptr;
    throwIfAsked(*result);
    return std::make_shared<ScriptedObject>(whole);
  }
};

}  // namespace

#pragma GCC visibility push(default)

const std::string sGlobalNamespace = "scripted-global";

std::shared_ptr<ConfigStore> ConfigStore::GetStore(const std::string &nameSpace) {
  write("GetStore " + quoted(nameSpace));
  const Result *result = scripted("store");
  if (result == nullptr) return nullptr;
  throwIfAsked(*result);
  return std::make_shared<ScriptedStore>();
}

#pragma GCC visibility pop

}  // namespace KestrelConfigStore
