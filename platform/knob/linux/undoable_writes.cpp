// SPDX-License-Identifier: Apache-2.0
// An undo that fails itself cannot be helped: it leaves what a crash would leave, and check() finds
// that.
#include "knob/linux/undoable_writes.h"

namespace Knob::Linux {

Writes::~Writes() {
  for (auto step = undo_.rbegin(); step != undo_.rend(); ++step) {
    try {
      (*step)();
    } catch (const KernelError &) {
      // the others are still worth undoing
    }
  }
}

void Writes::record(Group &group, const Record *before, const Record &after) {
  if (before == nullptr) {
    writeRecord(group, after, Attribute::kNew);
    undo_.emplace_back([&group] { removeAttribute(group.directory, kRecordAttribute); });
  } else {
    undo_.emplace_back([&group, old = *before] { writeRecord(group, old); });
    writeRecord(group, after);
  }
}

void Writes::control(Group &group, Control control, const std::string &before,
                     const std::string &after) {
  if (before == after) return;
  undo_.emplace_back([this, &group, control, before] { groups_.write(group, control, before); });
  groups_.write(group, control, after);
}

void writeRecord(Group &group, const Record &record, Attribute kind) {
  const RecordBytes bytes = encode(record);
  writeAttribute(group.directory, kRecordAttribute, {bytes.data(), bytes.size()}, kind);
  group.unrecordedMax.reset();
}

}  // namespace Knob::Linux
