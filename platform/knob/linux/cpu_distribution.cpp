// SPDX-License-Identifier: Apache-2.0
// A record says how the CPU was divided only after the weights of all children have been written.
// So when a process is killed in between, the next change finds another division there and writes
// them all again.
#include "knob/linux/cpu_distribution.h"

#include <algorithm>
#include <utility>
#include <vector>

#include "knob/admission.h"
#include "knob/linux/control_values.h"

namespace Knob::Linux {
namespace {

constexpr const char *kWeightFile = infoOf(Control::kCpuWeight).name;

uint64_t weightBeside(const CgroupTree &tree, const Child &other) {
  const std::string file = other.name + "/" + kWeightFile;
  const auto text = readControlIfAny(tree.hierarchy().directory.get(), file.c_str());
  return text ? parseLimit(*text).value_or(0) : 0;
}

bool reservesNothing(const Record &host) {
  return reservationOf(host.cpu) == 0 && host.cpuChildren == CpuChildren();
}

// One update of the weights.
class Update {
 public:
  Update(CgroupTree &tree, const CpuDistribution &distribution, UndoableWrites &writes,
         const CpuChildChange &change)
      : tree_(tree), distribution_(distribution), writes_(writes), change_(change) {}

  void run(const GroupPtr &group) {
    for (GroupPtr at = group; at; at = tree_.parentOf(*at)) chain_.push_back(at);
    std::reverse(chain_.begin(), chain_.end());
    const Record host = readRecord(chain_.front()->fd()).record;
    if (reservesNothing(host)) {
      // Linux has given a new group the weight of its shares.
      if (change_.count != 0) return;
      const Record record = readRecord(group->fd()).record;
      return write(*group, weightOfShares(record.cpu.allocation.shares));
    }
    const HostCpu own = distribution_.hostCpuBesideOthers(host);
    write(*chain_.front(), own.weight);
    divide(*chain_.front(), own.guaranteed, 1);
  }

 private:
  static constexpr size_t kOffChain = SIZE_MAX;

  // next: the index in the chain of the child that leads to the group that has changed.
  void divide(Group &group, MachinePart guaranteed, size_t next) {
    const StoredRecord stored = readRecord(group.fd());
    Record after = stored.record;
    after.cpuChildren = dividedAmong(count(group, stored.record), guaranteed,
                                     distribution_.partOf(stored.record.cpu.childrenSum));
    const CpuDivision &division = after.cpuChildren.division;
    const GroupPtr nextChild = next < chain_.size() ? chain_[next] : GroupPtr();
    if (division != stored.record.cpuChildren.division) {
      forEachChild(group, [&](Group &child) {
        if (!nextChild || child.id != nextChild->id) give(child, division, kOffChain);
      });
    }
    if (nextChild) give(*nextChild, division, next + 1);
    if (after.cpuChildren != stored.record.cpuChildren) writes_.write(group, stored, after);
  }

  // Without those that another program deletes meanwhile.
  template <typename F>
  void forEachChild(const Group &group, const F &f) const {
    for (const Child &child : readChildren(group.fd())) {
      try {
        f(*tree_.find(child.id));
      } catch (const KernelError &error) {
        if (error.status != Status::kNotFound) throw;
      }
    }
  }

  // A group without a record belongs to another program and keeps its weight.
  void give(Group &child, const CpuDivision &division, size_t next) {
    const StoredRecord stored = distribution_.readCounted(child);
    const CpuChild own = distribution_.childOf(stored.record);
    if (stored.isStored) write(child, cpuWeightOf(division, own));
    const bool isDivided =
        stored.record.cpu.childrenSum != 0 || stored.record.cpuChildren != CpuChildren();
    if (isDivided || next <= chain_.size()) divide(child, guaranteedPart(division, own), next);
  }

  // The sums are kept from the first reservation among the children on.
  CpuChildren count(const Group &group, const Record &record) const {
    if (record.cpu.childrenSum == 0) return {};
    CpuChildren sums = record.cpuChildren;
    if (sums.count != 0 && group.id != change_.parent) return sums;
    const int64_t count = static_cast<int64_t>(sums.count) + change_.count;
    const int64_t shareWeight = static_cast<int64_t>(sums.shareWeight) + change_.shareWeight;
    const bool isUsable = sums.count != 0 && count > 0 && shareWeight > 0;
    if (!isUsable || !change_.isKnown) return countAnew(group);
    sums.count = static_cast<uint64_t>(count);
    sums.shareWeight = static_cast<uint64_t>(shareWeight);
    return sums;
  }

  CpuChildren countAnew(const Group &group) const {
    CpuChildren sums;
    forEachChild(group, [&](const Group &child) {
      const Record record = readRecord(child.fd()).record;
      sums.count += 1;
      sums.shareWeight += static_cast<uint64_t>(weightOfShares(record.cpu.allocation.shares));
    });
    return sums;
  }

  void write(Group &group, int64_t weight) {
    const std::string before =
        readControlIfAny(group.fd(), kWeightFile).value_or(infoOf(Control::kCpuWeight).initialText);
    writes_.write(group, Control::kCpuWeight, before, std::to_string(weight));
  }

  CgroupTree &tree_;
  const CpuDistribution &distribution_;
  UndoableWrites &writes_;
  const CpuChildChange &change_;
  std::vector<GroupPtr> chain_;  // from host to the group that has changed
};

}  // namespace

CpuChildren dividedAmong(CpuChildren counted, MachinePart guaranteed, MachinePart reservation) {
  counted.division = divideCpu({guaranteed, reservation, counted.shareWeight, counted.count});
  return counted;
}

void CpuDistribution::requireKept(const ResourceState &hostCpu) const {
  Record host;
  host.cpu = hostCpu;
  if (hostCpuBesideOthers(host).keepsReservation) return;
  throw KernelError(Status::kReservationRefused, tooHeavyText());
}

void CpuDistribution::update(UndoableWrites &writes, const GroupPtr &group,
                             const CpuChildChange &change) const {
  Update(tree_, *this, writes, change).run(group);
}

int64_t CpuDistribution::recordedWeight(Group &group, const Record &record) const {
  const GroupPtr parent = tree_.parentOf(group);
  if (!parent) return hostCpuBesideOthers(record).weight;
  const Record above = readRecord(parent->fd()).record;
  return cpuWeightOf(above.cpuChildren.division, childOf(record));
}

CpuChild CpuDistribution::childOf(const Record &record) const {
  return {partOf(reservationOf(record.cpu)), weightOfShares(record.cpu.allocation.shares)};
}

HostCpu CpuDistribution::hostCpuBesideOthers(const Record &host) const {
  const CpuChild own = childOf(host);
  if (own.reservation == 0) return hostCpu(own, 0);
  uint64_t weight = 0;
  for (const Child &other : tree_.besideHost()) weight += weightBeside(tree_, other);
  return hostCpu(own, weight);
}

std::string CpuDistribution::tooHeavyText() const {
  std::string others;
  for (const Child &other : tree_.besideHost()) {
    others += (others.empty() ? "" : ", ") + other.name + " (" +
              std::to_string(weightBeside(tree_, other)) + ")";
  }
  return "no cpu.weight of host keeps its CPU reservation beside " + others +
         "; lower their weights or reserve less";
}

}  // namespace Knob::Linux
