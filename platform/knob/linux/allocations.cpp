// SPDX-License-Identifier: Apache-2.0
// A change that grows is written from the top of the tree down, one that shrinks from the bottom
// up: a process that is killed in between leaves too much reserved, never too little.
#include "knob/linux/allocations.h"

#include <algorithm>
#include <tuple>

#include "knob/admission.h"
#include "knob/allocation.h"
#include "knob/linux/lowering.h"
#include "knob/peaks.h"

namespace Knob::Linux {
namespace {

constexpr Resource kResources[] = {Resource::kMemory, Resource::kCpu};

bool areEqual(const Allocation &left, const Allocation &right) {
  return std::tie(left.min, left.max, left.minLimit, left.shares) ==
         std::tie(right.min, right.max, right.minLimit, right.shares);
}

void raisePeaks(Record &record) {
  record.peaks = raisedPeaks(record.peaks, record.memory.allocation.min, record.memory.childrenSum);
}

// What the sums above count of a group: without a record nothing yet.
ResourceState countedState(const StoredRecord &stored, Resource resource) {
  ResourceState state = stored.record.state(resource);
  if (!stored.isStored) state.allocation = Allocation();
  return state;
}

}  // namespace

std::string textOf(const Deviation &deviation) {
  const std::string name = infoOf(deviation.expected.control).name;
  if (!deviation.actual) return "there is no " + name + ": its controller is not enabled";
  return name + " is " + *deviation.actual + ", not " + deviation.expected.text;
}

void AllocationManager::change(Group &group, Resource resource, const AllocationChange &change) {
  StoredRecord stored = readToChange(group);
  const Allocation current = stored.record.state(resource).allocation;
  const Allocation wanted = changedAllocation(current, change);
  if (stored.record.savedHigh) restoreMemoryHigh(group, stored.record);
  if (areEqual(wanted, current)) return;
  requireNoneReservedBelow(stored.record.state(resource), wanted);
  if (resource == Resource::kCpu && countForeignMinimum(group, stored)) {
    stored = readToChange(group);
  }
  apply(group, stored, resource, wanted);
}

void AllocationManager::remove(Group &group, Group &parent) {
  const StoredRecord stored = readRecord(group.fd());
  std::vector<Ancestor> ancestors;
  for (Resource resource : kResources) {
    ResourceState own;
    own.allocation.min = reservationOf(countedState(stored, resource));
    admitInto(ancestors, group, resource, own, Allocation());
  }
  tree_.remove(group, parent);
  UndoableWrites writes(tree_);
  for (const Ancestor &ancestor : ancestors) writeAncestor(writes, ancestor);
  writes.commit();
}

std::vector<Deviation> AllocationManager::deviations(const Group &group,
                                                     const Record &record) const {
  std::vector<Deviation> found;
  for (Resource resource : kResources) {
    for (ControlText &expected : controlTextsFor(resource, record.state(resource), facts_.cpus)) {
      auto actual = readControlIfAny(group.fd(), infoOf(expected.control).name);
      if (actual != expected.text) found.push_back({std::move(expected), std::move(actual)});
    }
  }
  return found;
}

// A record that cannot be read may be that of a newer library, so it is not overwritten.
StoredRecord AllocationManager::readToChange(Group &group) {
  StoredRecord stored = readRecord(group.fd());
  if (stored.isDamaged) {
    throw KernelError(Status::kFailure, "the record of " + tree_.nameOf(group) +
                                            " is damaged or of another version; see knobctl check");
  }
  return stored;
}

bool AllocationManager::countForeignMinimum(Group &group, const StoredRecord &stored) {
  const Allocation &memory = stored.record.memory.allocation;
  if (stored.isStored || memory.min == 0) return false;
  apply(group, stored, Resource::kMemory, memory);
  return true;
}

void AllocationManager::apply(Group &group, const StoredRecord &stored, Resource resource,
                              const Allocation &wanted) {
  Record after = stored.record;
  after.state(resource).allocation = wanted;
  raisePeaks(after);
  const ResourceState counted = countedState(stored, resource);
  const bool grows = reservationOf(after.state(resource)) > reservationOf(counted);
  std::vector<Ancestor> ancestors;
  admitInto(ancestors, group, resource, counted, wanted);
  if (grows) std::reverse(ancestors.begin(), ancestors.end());

  UndoableWrites writes(tree_);
  ControlTexts from = currentTexts(group, stored, resource);
  const ControlTexts to = controlTextsFor(resource, after.state(resource), facts_.cpus);
  if (resource == Resource::kMemory && isLowerLimit(from[1].text, to[1].text)) {
    lowerMemoryMax(tree_, group, stored, from[1].text, to[1].text, writes);
    from[1] = to[1];
  }
  if (grows) {
    for (const Ancestor &ancestor : ancestors) writeAncestor(writes, ancestor);
  }
  writes.write(group, stored, after);
  for (size_t i = 0; i < to.size(); ++i) {
    writes.write(group, to[i].control, from[i].text, to[i].text);
  }
  if (!grows) {
    for (const Ancestor &ancestor : ancestors) writeAncestor(writes, ancestor);
  }
  writes.commit();
}

// Reads the ancestors of a group as far as their sums change, the parent first, and puts the sums
// into their records. ancestors: those that the same change has read for the other resource. own:
// the group as the sums count it now.
void AllocationManager::admitInto(std::vector<Ancestor> &ancestors, Group &group, Resource resource,
                                  const ResourceState &own, const Allocation &wanted) {
  std::vector<ResourceState> states = {own};
  int64_t before = reservationOf(own);
  int64_t after = reservationOf({wanted, own.childrenSum});
  GroupPtr above = before == after ? GroupPtr() : tree_.parentOf(group);
  for (size_t i = 0; above && before != after; ++i) {
    if (i == ancestors.size()) {
      StoredRecord stored = readToChange(*above);
      if (countForeignMinimum(*above, stored)) stored = readToChange(*above);
      ancestors.push_back({above, stored, stored.record});
    }
    const ResourceState &state = ancestors[i].after.state(resource);
    states.push_back(state);
    const int64_t sum = changedSum(state.childrenSum, before, after);
    before = reservationOf(state);
    after = reservationOf({state.allocation, sum});
    above = tree_.parentOf(*above);
  }

  const auto admitted = admit(std::move(states), wanted, capacity(resource));
  if (!admitted) {
    throw KernelError(Status::kReservationRefused,
                      "no room in the group, in one above it or on the machine");
  }
  for (size_t i = 1; i < admitted->size(); ++i) {
    Record &record = ancestors[i - 1].after;
    record.state(resource) = (*admitted)[i];
    raisePeaks(record);
  }
}

// Another program may have written the files of a group without a record.
ControlTexts AllocationManager::currentTexts(const Group &group, const StoredRecord &stored,
                                             Resource resource) const {
  ControlTexts texts = controlTextsFor(resource, stored.record.state(resource), facts_.cpus);
  if (stored.isStored) return texts;
  for (auto &[control, text] : texts) {
    text = readControlIfAny(group.fd(), infoOf(control).name).value_or(infoOf(control).initialText);
  }
  return texts;
}

// Of an ancestor only the reservation changes, and with it the first file of the resource.
void AllocationManager::writeAncestor(UndoableWrites &writes, const Ancestor &ancestor) const {
  const auto &[group, before, after] = ancestor;
  writes.write(*group, before, after);
  for (Resource resource : kResources) {
    const ControlText from =
        controlTextsFor(resource, before.record.state(resource), facts_.cpus)[0];
    const ControlText to = controlTextsFor(resource, after.state(resource), facts_.cpus)[0];
    writes.write(*group, to.control, from.text, to.text);
  }
}

}  // namespace Knob::Linux
