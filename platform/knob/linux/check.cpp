// SPDX-License-Identifier: Apache-2.0
// The tree is listed from the top, then gone through from the leaves up, so that every sum is made
// of reservations that are right already.
#include "knob/linux/check.h"

#include <fcntl.h>

#include <algorithm>

#include "knob/linux/control_values.h"
#include "knob/linux/fixed_groups.h"
#include "knob/linux/memory_lowering.h"
#include "knob/linux/writes.h"
#include "knob/names.h"
#include "knob/peaks.h"
#include "knob/signature.h"

namespace Knob::Linux {
namespace {

struct Entry {
  GroupId id;
  std::string path;
  size_t parent;  // its place in the list; the first is its own
  int64_t memorySum = 0, cpuSum = 0;
};

class Checker {
 public:
  Checker(Groups &groups, Bookkeeper &books, const HostFacts &facts, bool repair)
      : groups_(groups), books_(books), facts_(facts), repair_(repair) {}

  std::vector<Finding> run() {
    checkLibrary();
    list();
    for (size_t i = entries_.size(); i-- > 0;) checkEntry(entries_[i]);
    return std::move(findings_);
  }

 private:
  // Records have a version of their own, so another interface's groups can be taken over.
  void checkLibrary() {
    const BuildSignature noted = readSignature(groups_);
    if (noted.md5 == buildSignature().md5) return;
    if (repair_) writeSignature(*groups_.host());
    report(std::string(kRootName),
           "it was made with a libknob of another interface, built " + noted.buildDate, repair_);
  }

  // A group that goes away meanwhile is no finding.
  template <typename F>
  void whileThere(const F &f) {
    try {
      f();
    } catch (const KernelError &error) {
      if (error.status != Status::kNotFound) throw;
    }
  }

  void list() {
    const GroupPtr host = groups_.lookUp(kRootName);
    entries_.push_back({host->id, std::string(kRootName), 0});
    for (size_t i = 0; i < entries_.size(); ++i) {
      whileThere([&] {
        for (const Child &child : groups_.children(*groups_.find(entries_[i].id))) {
          entries_.push_back({child.id, entries_[i].path + "/" + child.name, i});
        }
      });
    }
  }

  void checkEntry(Entry &entry) {
    whileThere([&] {
      const GroupPtr group = groups_.find(entry.id);
      Held held = books_.read(*group);
      if (held.isDamaged) mendRecord(entry, *group, held);
      if (held.isStored) checkRecord(entry, *group, held.record);
      if (!held.isStored && (entry.memorySum != 0 || entry.cpuSum != 0)) {
        noteMissingRecord(entry, *group, held);
      }
      if (!held.isStored) return;
      checkFiles(entry, *group, held.record);
      const Record &record = held.record;
      const int64_t memory = reservationOf({record.memory.allocation, entry.memorySum});
      const int64_t cpu = reservationOf({record.cpu.allocation, entry.cpuSum});
      if (&entry == &entries_.front()) return checkMachine(memory, cpu);
      Entry &parent = entries_[entry.parent];
      parent.memorySum = saturatedSum(parent.memorySum, memory);
      parent.cpuSum = saturatedSum(parent.cpuSum, cpu);
    });
  }

  void mendRecord(const Entry &entry, Group &group, Held &held) {
    if (repair_) {
      writeRecord(group, held.record);
      held.isStored = true;
    }
    report(entry.path, "its record is damaged or of another version; what its files say counts",
           repair_);
  }

  // A group that somebody made in the middle of the tree, or whose record was taken off.
  void noteMissingRecord(const Entry &entry, Group &group, Held &held) {
    if (repair_) {
      writeRecord(group, held.record);
      held.isStored = true;
      checkRecord(entry, group, held.record);
    } else {
      report(entry.path, "groups below it have reservations, but it has no record", false);
    }
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
    const RecordBytes before = encode(record);
    if (repair_ && encode(right) != before) writeRecord(group, right);
    if (repair_) record = right;
  }

  void checkSum(const Entry &entry, int64_t kept, int64_t counted, const std::string &unit) {
    if (kept == counted) return;
    report(entry.path,
           "its children reserve " + std::to_string(counted) + " " + unit + ", its record says " +
               std::to_string(kept),
           repair_);
  }

  void checkFiles(const Entry &entry, Group &group, const Record &record) {
    for (const Deviation &deviation : books_.deviations(group, record)) {
      std::string trouble;
      if (repair_) trouble = mendFile(group, record, deviation);
      report(entry.path, textOf(deviation) + trouble, repair_ && trouble.empty());
    }
  }

  // Why it could not be repaired; empty when it was.
  std::string mendFile(Group &group, const Record &record, const Deviation &deviation) {
    try {
      Writes writes(groups_);
      if (deviation.control == Control::kMemoryMax) {
        makeRoomBelow(groups_, group, {record, true, false}, record.memory.allocation.max, writes);
      }
      writes.control(group, deviation.control, deviation.actual.value_or(""), deviation.expected);
      writes.commit();
      return {};
    } catch (const KernelError &error) {
      if (error.status == Status::kNotFound) throw;
      return std::string(": ") + error.what();
    }
  }

  void checkMachine(int64_t memory, int64_t cpu) {
    const int64_t memoryRoom = machineCapacity(facts_, Resource::kMemory);
    const int64_t cpuRoom = machineCapacity(facts_, Resource::kCpu);
    if (memory > memoryRoom) {
      report(std::string(kRootName),
             "the groups reserve " + std::to_string(memory) + " MB, the machine has " +
                 std::to_string(memoryRoom),
             false);
    }
    if (cpu > cpuRoom) {
      report(std::string(kRootName),
             "the groups reserve " + std::to_string(cpu) + " percent of CPU, the machine has " +
                 std::to_string(cpuRoom),
             false);
    }
    for (std::string &text : unprotectedAbove(groups_, memory)) {
      report(std::string(kRootName), text, false);
    }
  }

  void report(const std::string &path, const std::string &text, bool repaired) {
    findings_.push_back({path, text, repaired});
  }

  Groups &groups_;
  Bookkeeper &books_;
  const HostFacts &facts_;
  const bool repair_;
  std::vector<Entry> entries_;
  std::vector<Finding> findings_;
};

}  // namespace

std::vector<std::string> unprotectedAbove(const Groups &groups, int64_t promisedMB) {
  std::vector<std::string> findings;
  const uint64_t promised = parseLimit(memoryText(promisedMB)).value_or(0);
  Platform::UniqueFd directory(
      ::openat(groups.hierarchy().directory.get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  std::string path = groups.hierarchy().path;
  while (directory) {
    // The root of the whole hierarchy has no such file, and needs none.
    const auto text = readControlIfAny(directory.get(), rowOf(Control::kMemoryMin).name);
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

std::vector<Finding> checkTree(Groups &groups, Bookkeeper &books, const HostFacts &facts,
                               bool repair) {
  return Checker(groups, books, facts, repair).run();
}

}  // namespace Knob::Linux
