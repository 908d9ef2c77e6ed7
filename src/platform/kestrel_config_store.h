// SPDX-License-Identifier: Apache-2.0
// The client of the host configuration store. An object is named by an id and holds named fields;
// a field is an integer, a real number, a truth value or a text.
//
// Every failure of the store is a ConfigStoreException. Everything handed out is shared with the
// caller and stays valid as long as it is held. One thread uses a store at a time.
#pragma once

#include <exception>
#include <memory>
#include <string>
#include <utility>

namespace KestrelConfigStore {

// Exceptions and classes keep one identity on both sides of the library's border.
#pragma GCC visibility push(default)

// The name space whose values hold for the whole host.
extern const std::string sGlobalNamespace;

// Names one object. A part that is not given stays empty.
struct ConfigStoreObjectId {
  std::string key, component, group, extra;
};

class ConfigStoreException : public std::exception {
 public:
  explicit ConfigStoreException(std::string message) : message_(std::move(message)) {}
  ~ConfigStoreException() override = default;
  const char *what() const noexcept override { return message_.c_str(); }

 private:
  std::string message_;
};

// A field holds a value of another type than the one asked for.
class InvalidTypeException : public ConfigStoreException {
 public:
  using ConfigStoreException::ConfigStoreException;
  ~InvalidTypeException() override = default;
};

class StoreObject {
 public:
  // Reads a field into *value; false, and *value untouched, when there is no such field. An
  // integer field answers both reads, a real one only the double read. Any other type throws
  // InvalidTypeException.
  virtual bool GetValue(const char *field, long *value) const = 0;
  virtual bool GetValue(const char *field, double *value) const = 0;
  virtual ~StoreObject() = default;
};

class ConfigStore {
 public:
  // The object of that id; empty when there is none.
  virtual std::shared_ptr<StoreObject> GetObject(const ConfigStoreObjectId &id) = 0;
  virtual ~ConfigStore() = default;

  // The host's store; empty when there is none. Throws when there is one that cannot be used.
  static std::shared_ptr<ConfigStore> GetStore(const std::string &nameSpace);
};

#pragma GCC visibility pop

}  // namespace KestrelConfigStore
