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
  undo_.emplace_back([&group, before] {
    if (before.isStored) return writeRecord(group.fd(), before.record);
    removeAttribute(group.fd(), kRecordAttribute);
  });
  writeRecord(group.fd(), after);
}

void UndoableWrites::write(Group &group, Control control, const std::string &before,
                           const std::string &after) {
  if (before == after) return;
  undo_.emplace_back([this, &group, control, before] { tree_.write(group, control, before); });
  tree_.write(group, control, after);
}

}  // namespace Knob::Linux
