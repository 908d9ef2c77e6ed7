// SPDX-License-Identifier: Apache-2.0
// One store behind libkestrelconfig and kestrelctl: the small interface that the SQLite store
// implements and that a loadable module implements for another engine. Header alone, so that a
// module needs nothing of this library but its headers.
//
// Every operation is one transaction against other processes, changes nothing when it fails, and
// fails with a KestrelConfigStore::ConfigStoreException that names the store and the reason.
#pragma once

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

// Which objects to list: every one, those of a component, or those of one of its groups.
struct Selection {
  std::optional<std::string> component, group;
};

// One fact about a store for people, as a label and a text.
using Detail = std::pair<std::string, std::string>;

class Backend {
 public:
  virtual ~Backend() = default;

  // The fields of one object; empty: no such object.
  virtual std::optional<Fields> read(const ObjectId &id) = 0;

  // The selected objects, all of one moment, by component, group, key and extra in byte order.
  virtual std::vector<StoredObject> list(const Selection &selection) = 0;

  // Writes one field and leaves the object's others as they are; makes the object if need be.
  virtual void setField(const ObjectId &id, const std::string &field, const Value &value) = 0;

  // false: nothing of that name. An object goes with its last field.
  virtual bool removeField(const ObjectId &id, const std::string &field) = 0;
  virtual bool removeObject(const ObjectId &id) = 0;

  // Puts each of these objects in the place of the one of the same id; the others stay. All of
  // them or none.
  virtual void replace(const std::vector<StoredObject> &objects) = 0;

  // What people want to know of a store that answers; asks it.
  virtual std::vector<Detail> details() = 0;

  // false when what was opened is no longer what the configuration names, and has to be opened
  // anew. Never waits.
  virtual bool current() = 0;
};

}  // namespace Kestrel
