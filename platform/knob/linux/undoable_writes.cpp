// SPDX-License-Identifier: Apache-2.0
// When undoing fails too, the groups are as after a crash, and `knobctl check --repair` repairs
// them.
#include "knob/linux/undoable_writes.h"

namespace Knob::Linux {

UndoableWrites::~UndoableWrites() {
  for (auto step = undo_.rbegin(); step != undo_.rend(); ++step) {
    try {
      (*step)();
    } catch (const std::exception &) {
      // The other steps are still worth undoing.
    }
  }
}

void UndoableWrites::write(Group &group, const StoredRecord &before, const Record &after) {
  if (before.isStored && encode(before.record) == encode(after)) return;
  // By its id, since as many groups as may change cannot all stay open.
  undo_.emplace_back([this, id = group.id, before] {
    const GroupPtr changed = tree_.find(id);
    if (before.isStored) return writeRecord(changed->fd(), before.record);
    removeAttribute(changed->fd(), kRecordAttribute);
  });
  writeRecord(group.fd(), after);
}

void UndoableWrites::write(Group &group, Control control, const std::string &before,
                           const std::string &after) {
  if (before == after) return;
  undo_.emplace_back(
      [this, id = group.id, control, before] { tree_.write(*tree_.find(id), control, before); });
  tree_.write(group, control, after);
}

}  // namespace Knob::Linux
