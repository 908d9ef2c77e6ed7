// SPDX-License-Identifier: Apache-2.0
// The value is read from the JSON library's events, and reading stops at the first one that no
// field can hold. So depth is limited, and a number that does not fit is refused instead of
// rounded.
#include "kestrel/etcd/object_value.h"

#include <cmath>
#include <cstdint>
#include <limits>
#include <nlohmann/json.hpp>

#include "kestrel/errors.h"

namespace Kestrel::Etcd {

namespace {

using Json = nlohmann::json;

class FieldReader : public nlohmann::json_sax<Json> {
 public:
  Fields takeFields() { return std::move(fields_); }

  bool null() override { refuse("is null"); }
  bool boolean(bool value) override { return add(value); }
  bool number_integer(number_integer_t value) override { return add(int64_t{value}); }

  bool number_unsigned(number_unsigned_t value) override {
    if (value > static_cast<uint64_t>(std::numeric_limits<int64_t>::max())) refuseSize();
    return add(static_cast<int64_t>(value));
  }

  // Integers beyond 64 bits arrive here too; their text has neither '.' nor an exponent.
  bool number_float(number_float_t value, const string_t &text) override {
    if (text.find_first_of(".eE") == text.npos) refuseSize();
    if (!std::isfinite(value)) refuse("is out of a real number's range");
    return add(value);
  }

  bool string(string_t &value) override { return add(std::move(value)); }
  bool binary(binary_t &) override { refuse("is binary"); }

  bool start_object(size_t) override {
    if (inObject_) refuse("is an object");
    inObject_ = true;
    return true;
  }

  bool key(string_t &name) override {
    name_ = name;
    if (fields_.count(name_) != 0) refuse("is given twice");
    return true;
  }

  bool end_object() override { return true; }
  bool start_array(size_t) override { refuse("is an array"); }
  bool end_array() override { return true; }

  bool parse_error(size_t position, const std::string &, const Json::exception &error) override {
    constexpr int kNumberOutOfRange = 406;
    if (error.id == kNumberOutOfRange) refuse("is out of a real number's range");
    throw ValueError("the value is not JSON: unreadable at byte " + std::to_string(position));
  }

 private:
  bool add(Value value) {
    if (!inObject_) throw ValueError("the value is not a JSON object");
    fields_.emplace(name_, std::move(value));
    return true;
  }

  [[noreturn]] void refuseSize() { refuse("is an integer that does not fit into 64 bits"); }

  [[noreturn]] void refuse(const char *why) {
    if (!inObject_) throw ValueError("the value is not a JSON object");
    throw ValueError("field \"" + name_ + "\" " + why);
  }

  Fields fields_;
  std::string name_;
  bool inObject_ = false;
};

std::string quoted(const std::string &text) {
  return Json(text).dump();
}

std::string formatValue(const std::string &name, const Value &value) {
  if (const auto *real = std::get_if<double>(&value)) {
    if (!std::isfinite(*real)) {
      throw ValueError("field \"" + name + "\" is " + print(value) +
                       ", for which JSON has no form");
    }
  }
  if (const auto *text = std::get_if<std::string>(&value)) {
    if (!isUtf8(*text)) throw ValueError("field \"" + name + "\" holds bytes that are not UTF-8");
    return quoted(*text);
  }
  return print(value);
}

}  // namespace

Fields parseFields(std::string_view json) {
  FieldReader reader;
  Json::sax_parse(json.begin(), json.end(), &reader);
  return reader.takeFields();
}

Fields fieldsOf(const std::string &key, std::string_view json) {
  try {
    return parseFields(json);
  } catch (const ValueError &error) {
    throw storeError("etcd", key, error.what());
  }
}

std::string formatFields(const Fields &fields) {
  std::string json = "{";
  for (const auto &[name, value] : fields) {
    if (!isUtf8(name)) throw ValueError("a field's name holds bytes that are not UTF-8");
    if (json.size() > 1) json += ",";
    json += quoted(name) + ":" + formatValue(name, value);
  }
  return json + "}";
}

}  // namespace Kestrel::Etcd
