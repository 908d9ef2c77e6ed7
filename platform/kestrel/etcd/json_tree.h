// SPDX-License-Identifier: Apache-2.0
// JSON from a server, as a tree. The text is untrusted: depth and the number of values are limited,
// and the time is linear in the length of the text. The JSON library's own parser with a callback
// takes quadratic time.
#pragma once

#include <cstddef>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace Kestrel::Etcd {

// The response is not one that etcd sends.
class ProtocolError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// One JSON value. A reader checks the kind first; the members that belong to other kinds are empty.
struct JsonTree {
  enum class Kind { kNull, kBoolean, kNumber, kText, kArray, kObject };

  Kind kind = Kind::kNull;
  bool truth = false;
  std::string text;  // of a text, its value; of a number, its characters
  std::vector<JsonTree> items;
  std::vector<std::pair<std::string, JsonTree>> members;  // in the order of the text

  // The first member of that name that is not null; null pointer: there is none.
  const JsonTree *find(std::string_view name) const;
};

// etcd nests its responses 7 deep. A range of 10,000 keys has 60,000 values.
inline constexpr size_t kMaxJsonDepth = 16;
inline constexpr size_t kMaxJsonValues = 500000;

// Throws ProtocolError: not JSON, or beyond the limits.
JsonTree parseJson(std::string_view json);

}  // namespace Kestrel::Etcd
