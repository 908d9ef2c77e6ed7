// SPDX-License-Identifier: Apache-2.0
// Everything that is not understood is an error with its place; nothing is skipped.
#include "kestrel/exchange_read.h"

#include <yaml-cpp/yaml.h>

#include <array>
#include <set>
#include <tuple>
#include <utility>

#include "kestrel/object_names.h"

namespace Kestrel {

namespace {

// yaml-cpp's tags of scalars without a tag: quoted, and plain.
constexpr const char *kQuotedTag = "!";
constexpr const char *kPlainTag = "?";

constexpr std::array<std::pair<std::string_view, Type>, 4> kStandardTags = {{
    {"tag:yaml.org,2002:int", Type::kInteger},
    {"tag:yaml.org,2002:float", Type::kReal},
    {"tag:yaml.org,2002:bool", Type::kBoolean},
    {"tag:yaml.org,2002:str", Type::kText},
}};

// YAML's own spellings of reals that are not finite numbers.
constexpr std::array<std::pair<std::string_view, std::string_view>, 3> kSpecialReals = {{
    {".nan", "nan"},
    {".inf", "inf"},
    {"-.inf", "-inf"},
}};

class Reader {
 public:
  explicit Reader(const std::string &fileName) : fileName_(fileName) {}

  std::vector<StoredObject> read(const std::string &text) const {
    const YAML::Node root = load(text);
    if (!root.IsSequence()) fail(root.Mark(), "a sequence of objects is expected");
    std::vector<StoredObject> objects;
    std::set<std::tuple<std::string, std::string, std::string, std::string>> seen;
    for (const YAML::Node &node : root) {
      objects.push_back(readObject(node));
      const ObjectId &id = objects.back().id;
      if (!seen.emplace(id.component, id.group, id.key, id.extra).second) {
        fail(node.Mark(), describe(id) + " is given twice");
      }
    }
    return objects;
  }

 private:
  [[noreturn]] void fail(const YAML::Mark &mark, const std::string &why) const {
    std::string place = fileName_;
    if (!mark.is_null()) {
      place += ":" + std::to_string(mark.line + 1) + ":" + std::to_string(mark.column + 1);
    }
    throw ExchangeError(place + ": " + why);
  }

  // One document only: others would be lost silently.
  YAML::Node load(const std::string &text) const {
    if (!isUtf8(text)) fail(YAML::Mark::null_mark(), "the file is not UTF-8");
    try {
      const std::vector<YAML::Node> documents = YAML::LoadAll(text);
      if (documents.size() == 1) return documents[0];
      fail(YAML::Mark::null_mark(),
           documents.empty() ? "the file is empty" : "the file holds more than one document");
    } catch (const YAML::Exception &error) {
      fail(error.mark, error.msg);
    }
  }

  StoredObject readObject(const YAML::Node &node) const {
    if (!node.IsMap()) fail(node.Mark(), "an object is a mapping");
    StoredObject object;
    const std::array<std::pair<const char *, std::string *>, 4> parts = {{
        {"component", &object.id.component},
        {"group", &object.id.group},
        {"key", &object.id.key},
        {"extra", &object.id.extra},
    }};
    std::set<std::string> seen;
    for (const auto &entry : node) {
      const std::string name = readName(entry.first);
      if (!seen.insert(name).second) fail(entry.first.Mark(), "\"" + name + "\" is given twice");
      if (name == "fields") {
        object.fields = readFields(entry.second);
        continue;
      }
      std::string *part = nullptr;
      for (const auto &[known, target] : parts) {
        if (name == known) part = target;
      }
      if (part == nullptr) fail(entry.first.Mark(), "unknown key \"" + name + "\"");
      *part = readName(entry.second);
    }
    for (const char *needed : {"component", "group", "key", "fields"}) {
      if (seen.count(needed) == 0) fail(node.Mark(), std::string("no \"") + needed + "\"");
    }
    return checked(node, object);
  }

  StoredObject checked(const YAML::Node &node, const StoredObject &object) const {
    try {
      checkId(object.id);
    } catch (const ValueError &error) {
      fail(node.Mark(), error.what());
    }
    return object;
  }

  std::string readName(const YAML::Node &node) const {
    if (!node.IsScalar()) fail(node.Mark(), "a text is expected");
    return node.Scalar();
  }

  Fields readFields(const YAML::Node &node) const {
    if (!node.IsMap()) fail(node.Mark(), "the fields are a mapping");
    Fields fields;
    for (const auto &entry : node) {
      const std::string name = readName(entry.first);
      try {
        checkFieldName(name);
        if (!fields.emplace(name, readValue(entry.second)).second) {
          fail(entry.first.Mark(), "field \"" + name + "\" is given twice");
        }
      } catch (const ValueError &error) {
        fail(entry.second.Mark(), error.what());
      }
    }
    return fields;
  }

  Value readValue(const YAML::Node &node) const {
    if (!node.IsScalar())
      fail(node.Mark(), "a field is an integer, a real, a truth value or a text");
    const std::string &tag = node.Tag();
    const std::string &text = node.Scalar();
    if (tag == kQuotedTag) return parseAs(Type::kText, text);
    for (const auto &[spelling, word] : kSpecialReals) {
      if (tag == kPlainTag && text == spelling) return parseAs(Type::kReal, word);
    }
    if (tag == kPlainTag || tag.empty()) return parseByForm(text);
    for (const auto &[known, type] : kStandardTags) {
      if (tag == known) return parseAs(type, text);
    }
    fail(node.Mark(), "unknown tag \"" + tag + "\"");
  }

  const std::string &fileName_;
};

}  // namespace

std::vector<StoredObject> readExchange(const std::string &text, const std::string &fileName) {
  return Reader(fileName).read(text);
}

}  // namespace Kestrel
