// SPDX-License-Identifier: Apache-2.0
// The writes of one operation, each with what was there before. Unless they are committed, the
// destructor restores everything, newest first.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "knob/linux/cgroup_tree.h"
#include "knob/linux/record.h"

namespace Knob::Linux {

class UndoableWrites {
 public:
  explicit UndoableWrites(CgroupTree &tree) : tree_(tree) {}
  ~UndoableWrites();
  UndoableWrites(const UndoableWrites &) = delete;
  UndoableWrites &operator=(const UndoableWrites &) = delete;

  // Write unless before and after are equal. Throw KernelError.
  void write(Group &group, const StoredRecord &before, const Record &after);
  void write(Group &group, Control control, const std::string &before, const std::string &after);

  void commit() { undo_.clear(); }

 private:
  CgroupTree &tree_;
  std::vector<std::function<void()>> undo_;
};

}  // namespace Knob::Linux
