// SPDX-License-Identifier: Apache-2.0
// One store behind libkestrelconfig and kestrelctl: the small interface that the SQLite store
// implements, and that a loadable module implements for another engine. A header alone, so that a
// module needs nothing of this library but its headers.
//
// Every operation is one transaction against other processes, changes nothing when it fails, and
// fails with a KestrelConfigStore::ConfigStoreException that names the store and the reason. One
// thread at a time uses a backend.
#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "kestrel/value.h"
#include "platform/kestrel_config_store.h"

namespace Kestrel {

using ObjectId = KestrelConfigStore::ConfigStoreObjectId;
using Fields = std::map<std::string, Value>;

struct StoredObject {
  ObjectId id;
  Fields fields;
};

// Which objects to list: all, those of a component, or those of one of its groups.
struct Selection {
  std::optional<std::string> component, group;
};

// An object that cannot be read, by the name that the store has for it.
struct Damage {
  std::string name, why;
};

// What one layer of a store has of an object.
struct LayerFields {
  std::string layer;  // for people: the etcd prefix, or the path of the SQLite file
  Fields fields;
};

struct Listing {
  std::vector<StoredObject> objects;  // by component, group, key and extra in byte order
  std::vector<Damage> damaged;
};

// One fact about a store for people, as a label and a text.
using Detail = std::pair<std::string, std::string>;

// Where the lookups of a run took their values.
struct RunSource {
  std::string name;      // "sqlite", "etcd", "etcd without a quorum", "last known good", "none"
  int64_t revision = 0;  // the store's; 0: it has none, or nothing was read
  // When the values were read from the store.
  std::chrono::system_clock::time_point time = std::chrono::system_clock::now();
  std::string problem;  // why the values may be old; empty: they were current
};

// What an inspection of a store found.
struct Health {
  std::vector<Detail> details;
  bool readable = true;
  std::string problem;  // why it cannot be read, accepts no change, or its values may be old
};

class Backend {
 public:
  virtual ~Backend() = default;

  // The present fields of one object; empty: the object does not exist.
  virtual std::optional<Fields> read(const ObjectId &id) = 0;

  // The same, layer by layer, the most particular first; layers without the object are left out.
  virtual std::vector<LayerFields> layers(const ObjectId &id) = 0;

  // The same as read(), for the lookups of a run. An engine may read ahead: all lookups through one
  // backend then return values of one moment.
  virtual std::optional<Fields> lookUp(const ObjectId &id) { return read(id); }
  virtual RunSource source() const = 0;

  // The selected objects, all of one moment. Fails only when the store cannot be read; a damaged
  // object does not hide the others.
  virtual Listing list(const Selection &selection) = 0;

  // Writes one field and leaves the object's other fields as they are. Makes the object if needed.
  virtual void setField(const ObjectId &id, const std::string &field, const Value &value) = 0;

  // false: there is nothing of that name. An object is deleted with its last field.
  virtual bool removeField(const ObjectId &id, const std::string &field) = 0;
  virtual bool removeObject(const ObjectId &id) = 0;

  // Replaces the objects of the same ids, with all their fields. Other objects stay. All or none.
  virtual void replace(const std::vector<StoredObject> &objects) = 0;

  // Moves an object from one layer to another in one transaction: its fields replace those of the
  // same names there, and it is deleted here. false: the first layer does not have it.
  virtual bool move(const ObjectId &id, const std::string &from, const std::string &to) = 0;

  // Inspects the store. May throw when the store cannot be read at all.
  virtual Health health() = 0;

  // false when the opened store is no longer the one that the configuration names, and has to be
  // opened again. Never waits.
  virtual bool current() = 0;
};

}  // namespace Kestrel
