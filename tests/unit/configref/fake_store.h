// SPDX-License-Identifier: Apache-2.0
// A configuration store for tests in the place of the platform's: a table of fields, failures on
// demand, and a record of what was asked.
#pragma once

#include <functional>
#include <map>
#include <string>
#include <utility>
#include <variant>
#include <vector>

struct FakeStore {
  // A text stands for every field that neither read accepts.
  using Field = std::variant<long, double, std::string>;

  // The store that ConfigStore::GetStore hands out.
  static FakeStore &instance();

  // Back to a store that is there and holds nothing.
  void reset() { *this = FakeStore(); }

  // The objects by id, written "key/component/group/extra", with their fields by name.
  std::map<std::string, std::map<std::string, Field>> objects;

  // False: GetStore gives an empty pointer.
  bool exists = true;

  // Run at a call of that name, for those that throw: "GetStore", "GetObject", "GetValue long",
  // "GetValue double".
  std::map<std::string, std::function<void()>> at;

  // Each call as its name, a blank and what it was given.
  std::vector<std::string> calls;

  void called(const std::string &name, const std::string &argument);
};
