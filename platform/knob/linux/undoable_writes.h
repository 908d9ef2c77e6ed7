// SPDX-License-Identifier: Apache-2.0
// The writes of one operation, in order, each remembered with what was there before: an operation
// that fails half-way puts everything back, newest first.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "knob/linux/cgroup_tree.h"
#include "knob/linux/record.h"

namespace Knob::Linux {

class Writes {
 public:
  explicit Writes(Groups &groups) : groups_(groups) {}
  ~Writes();
  Writes(const Writes &) = delete;
  Writes &operator=(const Writes &) = delete;

  // before: absent where there was none. Throw KernelError (exists, when there is one after all).
  void record(Group &group, const Record *before, const Record &after);
  void control(Group &group, Control control, const std::string &before, const std::string &after);

  // What was written stays.
  void commit() { undo_.clear(); }

 private:
  Groups &groups_;
  std::vector<std::function<void()>> undo_;
};

// Writes a group's record. Throws KernelError; for kNew: exists, when it has one already.
void writeRecord(Group &group, const Record &record, Attribute kind = Attribute::kAny);

}  // namespace Knob::Linux
