// SPDX-License-Identifier: Apache-2.0
// A libkestrelconfig for tests: it writes down every lookup and answers it from a script, with
// values, with nothing, or with an exception. README.md beside this file describes its files.
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

struct Answer {
  std::string kind, text;  // integer, real, text, or an exception and its message
};

void throwIfAsked(const Answer &answer) {
  if (answer.kind == "ConfigStoreException") throw ConfigStoreException(answer.text);
  if (answer.kind == "InvalidTypeException") throw InvalidTypeException(answer.text);
  if (answer.kind == "runtime_error") throw std::runtime_error(answer.text);
}

// What is scripted, by "store", "object ID" and "field ID NAME".
using Script = std::map<std::string, Answer>;

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
      Answer answer;
      words >> answer.kind;
      std::getline(words >> std::ws, answer.text);
      made[line.substr(0, sign)] = answer;
    }
    return made;
  }();
  return only;
}

const Answer *scripted(const std::string &what) {
  const auto found = script().find(what);
  return found == script().end() ? nullptr : &found->second;
}

class ScriptedObject : public StoreObject {
 public:
  explicit ScriptedObject(std::string id) : id_(std::move(id)) {}

  bool GetValue(const char *field, long *value) const override {
    const Answer *answer = read("long", field);
    if (answer == nullptr) return false;
    if (answer->kind != "integer") throw InvalidTypeException("no integer");
    *value = std::stol(answer->text);
    return true;
  }

  bool GetValue(const char *field, double *value) const override {
    const Answer *answer = read("double", field);
    if (answer == nullptr) return false;
    if (answer->kind == "text") throw InvalidTypeException("no number");
    *value = std::stod(answer->text);
    return true;
  }

 private:
  const Answer *read(const char *type, const char *field) const {
    write(std::string("GetValue ") + type + " " + quoted(field));
    const Answer *answer = scripted("field " + id_ + " " + field);
    if (answer != nullptr) throwIfAsked(*answer);
    return answer;
  }

  const std::string id_;
};

class ScriptedStore : public ConfigStore {
 public:
  std::shared_ptr<StoreObject> GetObject(const ConfigStoreObjectId &id) override {
    write("GetObject key=" + quoted(id.key) + " component=" + quoted(id.component) +
          " group=" + quoted(id.group) + " extra=" + quoted(id.extra));
    const std::string whole = id.component + "/" + id.group + "/" + id.key;
    const Answer *answer = scripted("object " + whole);
    if (answer == nullptr) return nullptr;
    throwIfAsked(*answer);
    return std::make_shared<ScriptedObject>(whole);
  }
};

}  // namespace

#pragma GCC visibility push(default)

const std::string sGlobalNamespace = "scripted-global";

std::shared_ptr<ConfigStore> ConfigStore::GetStore(const std::string &nameSpace) {
  write("GetStore " + quoted(nameSpace));
  const Answer *answer = scripted("store");
  if (answer == nullptr) return nullptr;
  throwIfAsked(*answer);
  return std::make_shared<ScriptedStore>();
}

#pragma GCC visibility pop

}  // namespace KestrelConfigStore
