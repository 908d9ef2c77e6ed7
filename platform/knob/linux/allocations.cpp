// SPDX-License-Identifier: Apache-2.0
// A change that grows is written from the top of the tree down, one that shrinks from the bottom
// up: a process that is killed in between leaves too much reserved, never too little.
#include "knob/linux/allocations.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <tuple>

#include "knob/admission.h"
#include "knob/allocation.h"
#include "knob/linux/fixed_groups.h"
#include "knob/linux/lowering.h"
#include "knob/linux/oom_score.h"
#include "knob/names.h"
#include "knob/peaks.h"

namespace Knob::Linux {
namespace {

constexpr Resource kResources[] = {Resource::kMemory, Resource::kCpu};

std::string fixedChildPath() {
  return std::string(kRootName) + "/" + std::string(kFixedChildName);
}

bool areEqual(const Allocation &left, const Allocation &right) {
  return std::tie(left.min, left.max, left.minLimit, left.shares) ==
         std::tie(right.min, right.max, right.minLimit, right.shares);
}

// Whether only root, or the user of this process, can have written the group's record.
bool isOurs(const Group &group) {
  struct stat status {};
  if (::fstat(group.fd(), &status) != 0) fail(errno, "cannot examine the group's directory");
  return status.st_uid == 0 || status.st_uid == ::geteuid();
}

int64_t minimumIn(const Group &group) {
  const auto text = readControlIfAny(group.fd(), infoOf(Control::kMemoryMin).name);
  return text ? minimumMegabytes(parseLimit(*text).value_or(0)) : 0;
}

void raisePeaks(Record &record) {
  record.peaks = raisedPeaks(record.peaks, record.memory.allocation.min, record.memory.childrenSum);
}

int64_t weightIn(const StoredRecord &stored) {
  return weightOfShares(stored.record.cpu.allocation.shares);
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

void AllocationManager::add(const GroupPtr &group, Group &parent) {
  writeFirstRecord(group->fd());
  UndoableWrites writes(tree_);
  cpu_.update(writes, group, {parent.id, 1, weightIn({})});
  writes.commit();
}

void AllocationManager::change(Group &group, Resource resource, const AllocationChange &change) {
  StoredRecord stored = readToChange(group);
  const Allocation current = stored.record.state(resource).allocation;
  const Allocation wanted = changedAllocation(current, change);
  if (resource == Resource::kMemory && wanted.max == 0 && isFixedGroup(tree_, group)) {
    throw KernelError(Status::kPermissionDenied, "host and host/opt cannot be disabled");
  }
  if (stored.record.savedHigh) restoreMemoryHigh(group, stored.record);
  if (areEqual(wanted, current)) return;
  requireNoneReservedBelow(stored.record.state(resource), wanted);
  if (resource == Resource::kCpu && countForeignMinimum(group, stored)) {
    stored = readToChange(group);
  }
  apply(group, stored, resource, wanted);
}

void AllocationManager::remove(Group &group, Group &parent) {
  const StoredRecord stored = read(group);
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
  updateCpuWithout(parent, stored);
}

// The group is gone, so what fails here is left to `knobctl check`.
void AllocationManager::updateCpuWithout(Group &parent, const StoredRecord &removed) const {
  try {
    UndoableWrites writes(tree_);
    cpu_.update(writes, tree_.find(parent.id), {parent.id, -1, -weightIn(removed)});
    writes.commit();
  } catch (const KernelError &) {
    // The weights of the remaining groups keep at least what they kept before.
  }
}

std::vector<Deviation> AllocationManager::deviations(const Group &group, const Record &record,
                                                     int64_t weight) const {
  std::vector<Deviation> found;
  for (Resource resource : kResources) {
    ControlTexts texts = controlTextsFor(resource, record.state(resource));
    if (resource == Resource::kCpu) texts.push_back({Control::kCpuWeight, std::to_string(weight)});
    for (ControlText &expected : texts) {
      auto actual = readControlIfAny(group.fd(), infoOf(expected.control).name);
      if (actual != expected.text) found.push_back({std::move(expected), std::move(actual)});
    }
  }
  return found;
}

StoredRecord AllocationManager::read(Group &group) {
  StoredRecord stored = readRecord(group.fd());
  const GroupPtr parent = stored.isStored && !isOurs(group) ? tree_.parentOf(group) : GroupPtr();
  if (!parent) return stored;
  for (Resource resource : kResources) {
    ResourceState &state = stored.record.state(resource);
    const int64_t counted = countedFor(group, *parent, resource);
    state.allocation.min = std::min(state.allocation.min, counted);
    state.childrenSum = std::min(state.childrenSum, counted);
  }
  return stored;
}

// What is left of the parent's sum without the other children. Of another delegated one only the
// file counts that libknob wrote.
int64_t AllocationManager::countedFor(const Group &group, Group &parent, Resource resource) {
  int64_t counted = read(parent).record.state(resource).childrenSum;
  for (const Child &child : readChildren(parent.fd())) {
    if (child.id == group.id) continue;
    const GroupPtr sibling = tree_.find(child.id);
    const StoredRecord stored = readRecord(sibling->fd());
    if (isOurs(*sibling)) {
      counted = changedSum(counted, reservationOf(countedState(stored, resource)), 0);
    } else if (resource == Resource::kMemory) {
      counted = changedSum(counted, minimumIn(*sibling), 0);
    }
  }
  return counted;
}

// A record that cannot be read may be that of a newer library, so it is not overwritten.
StoredRecord AllocationManager::readToChange(Group &group) {
  StoredRecord stored = read(group);
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
  if (grows && resource == Resource::kCpu) requireCpuKept(ancestors, group, after.cpu);
  if (grows) std::reverse(ancestors.begin(), ancestors.end());

  UndoableWrites writes(tree_);
  ControlTexts from = currentTexts(group, stored, resource);
  const ControlTexts to = controlTextsFor(resource, after.state(resource));
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
  updateCpu(writes, group, stored, after);
  writes.commit();
  protectMembers(group, stored.record, after);
}

int AllocationManager::oomScoreAdj(const Record &record) const {
  return oomScoreAdjFor(record.memory.allocation.min, oomMachineBytes());
}

// Without the right to lower a value the minimum still protects from reclaim; check() reports it.
void AllocationManager::protectMembers(const Group &group, const Record &before,
                                       const Record &after) const {
  const int64_t formerMin = before.memory.allocation.min, min = after.memory.allocation.min;
  if (min == formerMin) return;
  if ((min == 0) != (formerMin == 0)) markForOomd(group.fd(), min != 0);
  for (const int64_t pid : readMembers(group.fd())) {
    (void)changeOomScoreAdj(pid, oomScoreAdj(before), oomScoreAdj(after));
  }
}

// Only a reservation of host itself competes with groups of other programs.
void AllocationManager::requireCpuKept(const std::vector<Ancestor> &ancestors, Group &group,
                                       const ResourceState &own) const {
  Group &top = ancestors.empty() ? group : *ancestors.back().group;
  if (tree_.parentOf(top)) return;
  cpu_.requireKept(ancestors.empty() ? own : ancestors.back().after.cpu);
}

void AllocationManager::updateCpu(UndoableWrites &writes, Group &group, const StoredRecord &before,
                                  const Record &after) const {
  const int64_t shareWeight = weightOfShares(after.cpu.allocation.shares) - weightIn(before);
  const bool isSame = shareWeight == 0 && before.isStored &&
                      reservationOf(after.cpu) == reservationOf(before.record.cpu);
  if (isSame) return;
  const GroupPtr parent = tree_.parentOf(group);
  cpu_.update(writes, tree_.find(group.id),
              {parent ? parent->id : 0, 0, shareWeight, before.isStored});
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

  const bool grows = reservationOf({wanted, own.childrenSum}) > reservationOf(own);
  const int64_t capacity = grows ? account(resource).capacity() : 0;
  Refusal refusal{};
  const auto admitted = admit(std::move(states), wanted, capacity, &refusal);
  if (!admitted) refuse(refusal, resource, group, ancestors);
  for (size_t i = 1; i < admitted->size(); ++i) {
    Record &record = ancestors[i - 1].after;
    record.state(resource) = (*admitted)[i];
    raisePeaks(record);
  }
}

// Of the groups directly below the ones at the paths, the few that reserve most.
std::vector<Holder> AllocationManager::largestReservations(Resource resource,
                                                           const std::vector<std::string> &paths) {
  constexpr size_t kMaxNamed = 3;
  std::vector<Holder> holders;
  for (const std::string &path : paths) {
    const GroupPtr group = tree_.lookUp(path);
    if (!group) continue;
    for (const Child &child : readChildren(group->fd())) {
      const std::string childPath = path + "/" + child.name;
      const GroupPtr below = childPath == fixedChildPath() ? GroupPtr() : tree_.lookUp(childPath);
      const int64_t reserved =
          below ? reservationOf(readRecord(below->fd()).record.state(resource)) : 0;
      if (reserved > 0) holders.push_back({childPath, reserved});
    }
  }
  std::stable_sort(holders.begin(), holders.end(), [](const Holder &left, const Holder &right) {
    return left.amount > right.amount;
  });
  if (holders.size() > kMaxNamed) holders.resize(kMaxNamed);
  return holders;
}

// "250 MB asked for, 116 MB free on the machine: 64 MB for the system, 300 MB for host/opt/a".
void AllocationManager::refuse(const Refusal &refusal, Resource resource, Group &group,
                               const std::vector<Ancestor> &ancestors) {
  const auto amount = [&](int64_t number) {
    return std::to_string(number) + " " + unitOf(resource);
  };
  std::string text = amount(refusal.asked) + " asked for, " +
                     amount(std::max<int64_t>(refusal.free, 0)) + " free ";
  std::vector<Holder> holders;
  std::vector<std::string> paths = {std::string(kRootName), fixedChildPath()};
  if (refusal.at > ancestors.size()) {
    text += "on the machine";
    holders = account(resource).holders;
  } else {
    paths = {tree_.pathOf(refusal.at == 0 ? group : *ancestors[refusal.at - 1].group)};
    text += "in " + paths.front();
  }
  for (Holder &each : largestReservations(resource, paths)) holders.push_back(std::move(each));
  for (size_t i = 0; i < holders.size(); ++i) {
    text += (i == 0 ? ": " : ", ") + amount(holders[i].amount) + " for " + holders[i].name;
  }
  throw KernelError(Status::kReservationRefused, text);
}

// Another program may have written the files of a group without a record.
ControlTexts AllocationManager::currentTexts(const Group &group, const StoredRecord &stored,
                                             Resource resource) const {
  ControlTexts texts = controlTextsFor(resource, stored.record.state(resource));
  if (stored.isStored) return texts;
  for (auto &[control, text] : texts) {
    text = readControlIfAny(group.fd(), infoOf(control).name).value_or(infoOf(control).initialText);
  }
  return texts;
}

// Of an ancestor only the reservations change, and with that of memory memory.min.
void AllocationManager::writeAncestor(UndoableWrites &writes, const Ancestor &ancestor) const {
  const auto &[group, before, after] = ancestor;
  writes.write(*group, before, after);
  writes.write(*group, Control::kMemoryMin, memoryText(reservationOf(before.record.memory)),
               memoryText(reservationOf(after.memory)));
}

}  // namespace Knob::Linux
