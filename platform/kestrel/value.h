// SPDX-License-Identifier: Apache-2.0
// The values that a field can hold, and their written forms: how a text on a command line or in an
// exchange file becomes a value, and how a value is printed so that reading gives it back exactly.
#pragma once

#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <variant>

namespace Kestrel {

// The order is that of the alternatives of Value.
enum class Type { kInteger, kReal, kBoolean, kText };

using Value = std::variant<int64_t, double, bool, std::string>;

// A text that cannot be read as the value it is meant to be.
class ValueError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// All the types' names, for help texts.
inline constexpr std::string_view kTypeNames = "integer, real, boolean or text";

Type typeOf(const Value &value);
std::string_view typeName(Type type);
std::optional<Type> typeNamed(std::string_view name);

// Reads a text by its own form: digits with an optional sign are an integer, digits with a dot or
// an exponent are a real number, "true" and "false" are truth values, anything else is a text. A
// number that its type cannot hold is a ValueError, never silently another type.
Value parseByForm(std::string_view text);

// Reads a text as one type. A real may also be a whole number, "nan", "inf" or "-inf".
Value parseAs(Type type, std::string_view text);

// The shortest text that reads back as the same value; a real always looks like one ("7.0").
std::string print(const Value &value);

// Texts and names are UTF-8, so that every store and every exchange format can hold them.
bool isUtf8(std::string_view text);

}  // namespace Kestrel
