// SPDX-License-Identifier: Apache-2.0
// Lists the tree from the top, then checks it from the leaves up, so that every sum is made of
// reservations that are correct already.
#include "knob/linux/check.h"

#include <fcntl.h>

#include "knob/linux/fixed_groups.h"
#include "knob/linux/lowering.h"
#include "knob/names.h"
#include "knob/peaks.h"
#include "knob/signature.h"

namespace Knob::Linux {
namespace {

struct Entry {
  GroupId id;
  std::string path;
  size_t parent;  // index in the list; that of the first is its own
  int64_t memorySum = 0, cpuSum = 0;
};

class Checker {
 public:
  Checker(CgroupTree &tree, AllocationManager &allocations, bool repair)
      : tree_(tree), allocations_(allocations), repair_(repair) {}

  std::vector<Finding> run() {
    checkLibrary();
    list();
    for (size_t i = entries_.size(); i-- > 0;) checkEntry(entries_[i]);
    return std::move(findings_);
  }

 private:
  // Records have a version of their own, so groups of another interface can be taken over.
  void checkLibrary() {
    const BuildSignature stored = readSignature(tree_);
    if (stored.md5 == buildSignature().md5) return;
    if (repair_) writeSignature(*tree_.host());
    report(std::string(kRootName),
           "it was made by a libknob with another interface, built " + stored.buildDate, repair_);
  }

  // A group that another program deletes meanwhile is not a finding.
  template <typename F>
  void whileThere(const F &f) {
    try {
      f();
    } catch (const KernelError &error) {
      if (error.status != Status::kNotFound) throw;
    }
  }

  void list() {
    entries_.push_back({tree_.host()->id, std::string(kRootName), 0});
    for (size_t i = 0; i < entries_.size(); ++i) {
      whileThere([&] {
        for (const Child &child : tree_.children(*tree_.find(entries_[i].id))) {
          entries_.push_back({child.id, entries_[i].path + "/" + child.name, i});
        }
      });
    }
  }

  void checkEntry(Entry &entry) {
    whileThere([&] {
      const GroupPtr group = tree_.find(entry.id);
      tree_.requireAlive(*group);
      StoredRecord stored = readRecord(group->fd());
      if (stored.isDamaged) repairRecord(entry, *group, stored);
      if (stored.isStored) checkRecord(entry, *group, stored.record);
      if (!stored.isStored && (entry.memorySum != 0 || entry.cpuSum != 0)) {
        checkMissingRecord(entry, *group, stored);
      }
      if (!stored.isStored) return;
      checkFiles(entry, *group, stored.record);
      addToParent(entry, stored.record);
    });
  }

  void addToParent(const Entry &entry, const Record &record) {
    const int64_t memory = reservationOf({record.memory.allocation, entry.memorySum});
    const int64_t cpu = reservationOf({record.cpu.allocation, entry.cpuSum});
    if (&entry == &entries_.front()) return checkMachine(memory, cpu);
    Entry &parent = entries_[entry.parent];
    parent.memorySum = changedSum(parent.memorySum, 0, memory);
    parent.cpuSum = changedSum(parent.cpuSum, 0, cpu);
  }

  void repairRecord(const Entry &entry, Group &group, StoredRecord &stored) {
    if (repair_) {
      writeRecord(group.fd(), stored.record);
      stored.isStored = true;
    }
    report(entry.path,
           "its record is damaged or of another version; its control files are used instead",
           repair_);
  }

  // A group that another program made between two of ours, or whose record was removed.
  void checkMissingRecord(const Entry &entry, Group &group, StoredRecord &stored) {
    if (!repair_) {
      return report(entry.path, "groups below it have reservations, but it has no record", false);
    }
    writeRecord(group.fd(), stored.record);
    stored.isStored = true;
    checkRecord(entry, group, stored.record);
  }

  void checkRecord(const Entry &entry, Group &group, Record &record) {
    Record right = record;
    right.memory.childrenSum = entry.memorySum;
    right.cpu.childrenSum = entry.cpuSum;
    right.peaks = raisedPeaks(right.peaks, right.memory.allocation.min, right.memory.childrenSum);
    checkSum(entry, record.memory.childrenSum, entry.memorySum, "MB of memory");
    checkSum(entry, record.cpu.childrenSum, entry.cpuSum, "percent of CPU");
    if (right.peaks.ownReservedPeakKB != record.peaks.ownReservedPeakKB ||
        (right.peaks.childrenReservedPeakKB != record.peaks.childrenReservedPeakKB &&
         record.memory.childrenSum == entry.memorySum)) {
      report(entry.path, "a peak is below what is reserved now", repair_);
    }
    if (record.savedHigh) {
      report(entry.path, std::string(kMemoryHighFile) + " was left lowered", repair_);
      if (repair_) restoreMemoryHigh(group, right);
    }
    if (!repair_) return;
    if (encode(right) != encode(record)) writeRecord(group.fd(), right);
    record = right;
  }

  void checkSum(const Entry &entry, int64_t recorded, int64_t counted, const std::string &unit) {
    if (recorded == counted) return;
    report(entry.path,
           "its children reserve " + std::to_string(counted) + " " + unit + ", its record says " +
               std::to_string(recorded),
           repair_);
  }

  void checkFiles(const Entry &entry, Group &group, const Record &record) {
    for (const Deviation &deviation : allocations_.deviations(group, record)) {
      std::string trouble;
      if (repair_) trouble = repairFile(group, record, deviation);
      report(entry.path, textOf(deviation) + trouble, repair_ && trouble.empty());
    }
  }

  // Returns why it could not be repaired; empty when it was.
  std::string repairFile(Group &group, const Record &record, const Deviation &deviation) {
    const auto &[control, text] = deviation.expected;
    const std::string actual = deviation.actual.value_or("");
    try {
      UndoableWrites writes(tree_);
      if (control == Control::kMemoryMax && isLowerLimit(actual, text)) {
        lowerMemoryMax(tree_, group, {record, true, false}, actual, text, writes);
      } else {
        writes.write(group, control, actual, text);
      }
      writes.commit();
      return {};
    } catch (const KernelError &error) {
      if (error.status == Status::kNotFound) throw;
      return std::string(": ") + error.what();
    }
  }

  void checkMachine(int64_t memory, int64_t cpu) {
    checkCapacity(Resource::kMemory, memory, " MB");
    checkCapacity(Resource::kCpu, cpu, " percent of CPU");
    for (std::string &text : unprotectedAbove(tree_.hierarchy(), memory)) {
      report(std::string(kRootName), text, false);
    }
  }

  void checkCapacity(Resource resource, int64_t reserved, const std::string &unit) {
    const int64_t capacity = allocations_.capacity(resource);
    if (reserved <= capacity) return;
    report(std::string(kRootName),
           "the groups reserve " + std::to_string(reserved) + unit + ", the machine has " +
               std::to_string(capacity),
           false);
  }

  void report(const std::string &path, const std::string &text, bool repaired) {
    findings_.push_back({path, text, repaired});
  }

  CgroupTree &tree_;
  AllocationManager &allocations_;
  const bool repair_;
  std::vector<Entry> entries_;
  std::vector<Finding> findings_;
};

}  // namespace

std::vector<Finding> checkTree(CgroupTree &tree, AllocationManager &allocations, bool repair) {
  return Checker(tree, allocations, repair).run();
}

std::vector<std::string> unprotectedAbove(const Hierarchy &hierarchy, int64_t promisedMB) {
  std::vector<std::string> findings;
  const uint64_t promised = parseLimit(memoryText(promisedMB)).value_or(0);
  Platform::UniqueFd directory(
      ::openat(hierarchy.directory.get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  std::string path = hierarchy.path;
  while (directory) {
    // The root of the whole hierarchy has no such file, and needs none.
    const auto text = readControlIfAny(directory.get(), infoOf(Control::kMemoryMin).name);
    if (!text) break;
    if (parseLimit(*text).value_or(0) < promised) {
      findings.push_back("memory.min of " + path + ", which is not ours, is " + *text +
                         ": less than the " + std::to_string(promised) +
                         " that host has promised, so the promise is void");
    }
    path = path.substr(0, path.rfind('/'));
    directory =
        Platform::UniqueFd(::openat(directory.get(), "..", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  }
  return findings;
}

}  // namespace Knob::Linux
