// SPDX-License-Identifier: Apache-2.0
// Lists the tree from the top, then checks it from the leaves up, so that every sum is made of
// reservations that are correct already.
#include "knob/linux/check.h"

#include <fcntl.h>

#include <utility>

#include "knob/linux/fixed_groups.h"
#include "knob/linux/lowering.h"
#include "knob/linux/oom_score.h"
#include "knob/names.h"
#include "knob/peaks.h"
#include "knob/signature.h"

namespace Knob::Linux {
namespace {

struct Entry {
  Entry(GroupId group, std::string name, size_t above)
      : id(group), path(std::move(name)), parent(above) {}

  GroupId id;
  std::string path;
  size_t parent;  // index in the list; that of the first is its own
  bool hasChildren = false;
  int64_t memorySum = 0, cpuSum = 0;
  CpuChildren cpuChildren;  // as counted, with the division that follows
  bool isCounted = false;   // it is there, and has a record
  Record record;
  MachinePart guaranteed = 0;
  int64_t weight = 0;
};

class Checker {
 public:
  Checker(CgroupTree &tree, AllocationManager &allocations, bool repair)
      : tree_(tree), allocations_(allocations), repair_(repair) {}

  std::vector<Finding> run() {
    checkLibrary();
    list();
    for (size_t i = entries_.size(); i-- > 0;) checkEntry(entries_[i]);
    for (Entry &entry : entries_) checkCpuChildren(entry);
    for (size_t i = entries_.size(); i-- > 0;) checkFiles(entries_[i]);
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
    entries_.emplace_back(tree_.host()->id, std::string(kRootName), 0);
    for (size_t i = 0; i < entries_.size(); ++i) {
      whileThere([&] {
        for (const Child &child : readChildren(tree_.find(entries_[i].id)->fd())) {
          entries_[i].hasChildren = true;
          entries_.emplace_back(child.id, entries_[i].path + "/" + child.name, i);
        }
      });
    }
  }

  void checkEntry(Entry &entry) {
    whileThere([&] {
      const GroupPtr group = tree_.find(entry.id);
      tree_.requireAlive(*group);
      StoredRecord stored = allocations_.read(*group);
      if (stored.isDamaged) repairRecord(entry, *group, stored);
      if (stored.isStored) checkRecord(entry, *group, stored.record);
      if (!stored.isStored && (entry.memorySum != 0 || entry.cpuSum != 0)) {
        checkMissingRecord(entry, *group, stored);
      }
      entry.record = stored.record;
      entry.isCounted = stored.isStored;
      if (&entry != &entries_.front()) addSharesTo(entries_[entry.parent], stored.record);
      if (stored.isStored) addToParent(entry, stored.record);
    });
  }

  void addSharesTo(Entry &parent, const Record &child) {
    parent.cpuChildren.count += 1;
    parent.cpuChildren.shareWeight +=
        static_cast<uint64_t>(weightOfShares(child.cpu.allocation.shares));
  }

  // From the top down: each group's division of the CPU follows from that above.
  void checkCpuChildren(Entry &entry) {
    Record counted = entry.record;
    counted.cpu.childrenSum = entry.cpuSum;
    const CpuDistribution &cpu = allocations_.cpu();
    if (&entry == &entries_.front()) {
      const HostCpu host = cpu.hostCpuBesideOthers(counted);
      entry.guaranteed = host.guaranteed;
      entry.weight = host.weight;
      if (!host.keepsReservation) report(entry.path, cpu.tooHeavyText(), false);
    } else {
      const CpuDivision &division = entries_[entry.parent].cpuChildren.division;
      entry.guaranteed = guaranteedPart(division, cpu.childOf(counted));
      entry.weight = cpuWeightOf(division, cpu.childOf(counted));
    }
    entry.cpuChildren = entry.cpuSum == 0 ? CpuChildren()
                                          : dividedAmong(entry.cpuChildren, entry.guaranteed,
                                                         cpu.partOf(entry.cpuSum));
    if (!entry.isCounted || entry.cpuChildren == entry.record.cpuChildren) return;
    report(entry.path, "the CPU weights below it are for other groups or reservations", repair_);
    if (repair_) whileThere([&] { repairCpuChildren(entry); });
  }

  void repairCpuChildren(Entry &entry) {
    entry.record.cpuChildren = entry.cpuChildren;
    writeRecord(tree_.find(entry.id)->fd(), entry.record);
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

  void checkFiles(const Entry &entry) {
    if (!entry.isCounted) return;
    whileThere([&] {
      const GroupPtr group = tree_.find(entry.id);
      tree_.requireAlive(*group);
      for (const Deviation &deviation :
           allocations_.deviations(*group, entry.record, entry.weight)) {
        std::string trouble;
        if (repair_) trouble = repairFile(*group, entry.record, deviation);
        report(entry.path, textOf(deviation) + trouble, repair_ && trouble.empty());
      }
      checkMembers(entry, *group);
      checkProtection(entry);
    });
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

  void checkProtection(const Entry &entry) {
    const int64_t surplus = entry.record.memory.allocation.min - entry.memorySum;
    if (tree_.hierarchy().protectsRecursively || !entry.hasChildren || surplus <= 0) return;
    report(entry.path,
           std::to_string(surplus) +
               " MB of its memory minimum protect nothing, since its child groups do not reserve "
               "them: cgroup2 is mounted without memory_recursiveprot",
           false);
  }

  // Processes that another program moved in.
  void checkMembers(const Entry &entry, const Group &group) {
    const int wanted = allocations_.oomScoreAdj(entry.record);
    if (wanted == 0) return;
    const std::vector<int64_t> without = withoutOomScoreAdj(readMembers(group.fd()), wanted);
    if (without.empty()) return;
    bool repaired = repair_;
    for (const int64_t pid : without) {
      repaired = repaired && changeOomScoreAdj(pid, 0, wanted);
    }
    report(entry.path,
           std::to_string(without.size()) + " of its processes lack the oom_score_adj of " +
               std::to_string(wanted) + " that its minimum asks for",
           repaired);
  }

  void checkMachine(int64_t memory, int64_t cpu) {
    checkCapacity(Resource::kMemory, memory);
    checkCapacity(Resource::kCpu, cpu);
    for (std::string &text : unprotectedAbove(tree_.hierarchy(), memory)) {
      report(std::string(kRootName), text, false);
    }
  }

  void checkCapacity(Resource resource, int64_t reserved) {
    const Account &account = allocations_.account(resource);
    if (reserved <= account.capacity()) return;
    report(std::string(kRootName),
           "more is promised than the machine can give: the groups reserve " +
               std::to_string(reserved) + " " + unitOf(resource) + ", it has " +
               std::to_string(account.capacity()) + " for them of " +
               std::to_string(account.total) + " (" + textOf(account) + ")",
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
