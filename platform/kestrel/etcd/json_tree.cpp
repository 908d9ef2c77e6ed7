// SPDX-License-Identifier: Apache-2.0
// The tree is built from the JSON library's events. Parsing stops at the first event beyond a
// limit.
#include "kestrel/etcd/json_tree.h"

#include <nlohmann/json.hpp>

namespace Kestrel::Etcd {

namespace {

using Json = nlohmann::json;

class TreeBuilder : public nlohmann::json_sax<Json> {
 public:
  JsonTree takeRoot() { return std::move(root_); }

  bool null() override { return add({}), true; }
  bool boolean(bool value) override {
    JsonTree tree;
    tree.kind = JsonTree::Kind::kBoolean;
    tree.truth = value;
    return add(std::move(tree)), true;
  }
  bool number_integer(number_integer_t value) override { return addNumber(std::to_string(value)); }
  bool number_unsigned(number_unsigned_t value) override {
    return addNumber(std::to_string(value));
  }
  bool number_float(number_float_t, const string_t &text) override { return addNumber(text); }
  bool string(string_t &value) override {
    return add(textOf(JsonTree::Kind::kText, std::move(value))), true;
  }
  bool binary(binary_t &) override { throw ProtocolError("not JSON"); }

  bool start_object(size_t) override { return open(JsonTree::Kind::kObject); }
  bool key(string_t &name) override {
    open_.back()->members.emplace_back(std::move(name), JsonTree());
    return true;
  }
  bool end_object() override { return close(); }
  bool start_array(size_t) override { return open(JsonTree::Kind::kArray); }
  bool end_array() override { return close(); }

  bool parse_error(size_t, const std::string &, const Json::exception &) override {
    throw ProtocolError("not JSON");
  }

 private:
  static JsonTree textOf(JsonTree::Kind kind, std::string text) {
    JsonTree tree;
    tree.kind = kind;
    tree.text = std::move(text);
    return tree;
  }

  bool addNumber(std::string text) {
    return add(textOf(JsonTree::Kind::kNumber, std::move(text))), true;
  }

  // The place of the value in the open array or object, or the root.
  JsonTree *add(JsonTree tree) {
    if (++values_ > kMaxJsonValues) throw ProtocolError("more values than a response of etcd has");
    JsonTree *place = &root_;
    if (!open_.empty()) {
      JsonTree &parent = *open_.back();
      const bool array = parent.kind == JsonTree::Kind::kArray;
      place = array ? &parent.items.emplace_back() : &parent.members.back().second;
    }
    *place = std::move(tree);
    return place;
  }

  bool open(JsonTree::Kind kind) {
    if (open_.size() == kMaxJsonDepth) throw ProtocolError("nested too deeply");
    // The pointer stays valid: the parent gets no other value until this one is closed.
    open_.push_back(add(textOf(kind, {})));
    return true;
  }
  bool close() {
    open_.pop_back();
    return true;
  }

  JsonTree root_;
  std::vector<JsonTree *> open_;
  size_t values_ = 0;
};

}  // namespace

const JsonTree *JsonTree::find(std::string_view name) const {
  for (const auto &[key, value] : members) {
    if (key == name) return value.kind == Kind::kNull ? nullptr : &value;
  }
  return nullptr;
}

JsonTree parseJson(std::string_view json) {
  TreeBuilder builder;
  Json::sax_parse(json.begin(), json.end(), &builder);
  return builder.takeRoot();
}

}  // namespace Kestrel::Etcd
