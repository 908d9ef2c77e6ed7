// SPDX-License-Identifier: Apache-2.0
// One definition file: every mistake in it, and the pools that the loader reads from it.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "calc/variable_table.h"
#include "loader/resource_pool.h"
#include "plan_check/finding.h"
#include "plan_check/source_file.h"

namespace Plan {

// A pool that the loader accepts, and where its parts are.
struct DeclaredPool {
  std::shared_ptr<Loader::ResourcePoolImpl> pool;
  std::string file;
  Place place;                               // of the item
  std::map<std::string, YAML::Node> values;  // by key; the last one where a key is given twice
  std::map<std::string, Place> keyPlaces;
};

struct CheckedFile {
  std::shared_ptr<const SourceFile> source;
  Findings findings;
  std::vector<DeclaredPool> pools;
};

// A file that cannot be read is a finding. NAME: what findings call the file.
CheckedFile checkFile(const std::string &path, const std::string &name,
                      const Calc::VariableTable &facts);

// The same for a text.
CheckedFile checkText(const std::string &name, std::string text, const Calc::VariableTable &facts);

// The place of the key, or of the item where the pool does not have the key.
Place placeOfKey(const DeclaredPool &pool, const std::string &key);

}  // namespace Plan
