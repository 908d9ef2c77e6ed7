// SPDX-License-Identifier: Apache-2.0
// Growing is written from the top down and shrinking from the bottom up, so that a process killed
// in between leaves too much reserved, never too little.
#include "knob/linux/bookkeeper.h"

#include <algorithm>
#include <chrono>
#include <limits>
#include <thread>

#include "knob/allocation.h"
#include "knob/linux/control_values.h"
#include "knob/linux/memory_lowering.h"
#include "knob/linux/tree_lock.h"
#include "knob/peaks.h"

namespace Knob::Linux {
namespace {

// A record that cannot be read may be a newer library's: it is not written over in passing.
const Held &requireReadable(const Held &held) {
  if (held.isDamaged) {
    throw KernelError(Status::kFailure,
                      "the group's record is damaged or of another version; see knobctl check");
  }
  return held;
}

Record newRecord(const Group &group) {
  Record record;
  record.memory.allocation.max = *group.unrecordedMax;
  return record;
}

// Of the few files of a group.
constexpr std::chrono::milliseconds kLongestWriting{5};

bool isLower(int64_t max, int64_t than) {
  return max != -1 && (than == -1 || max < than);
}

bool areEqual(const Allocation &a, const Allocation &b) {
  return a.min == b.min && a.max == b.max && a.minLimit == b.minLimit && a.shares == b.shares;
}

// Whether a new group with this memory allocation needs no record yet: its file says all of it.
bool isMaximumAlone(const Allocation &memory) {
  Allocation alone;
  alone.max = maximumMegabytes(parseLimit(memoryText(memory.max)).value_or(0));
  return areEqual(memory, alone);
}

[[noreturn]] void refuse(const std::string &where) {
  throw KernelError(Status::kReservationRefused, where + " has no room for this reservation");
}

Held fromAttribute(Group &group, const std::string &bytes) {
  group.unrecordedMax.reset();
  if (const auto record = decode(bytes)) return {*record, true, false};
  return {readFiles(group), false, true};
}

const Record *storedIn(const Held &held) {
  return held.isStored ? &held.record : nullptr;
}

}  // namespace

// A group above the one that changes.
struct Bookkeeper::Place {
  GroupPtr group;
  Held held;
};

int64_t saturatedSum(int64_t left, int64_t right) {
  constexpr int64_t kMost = std::numeric_limits<int64_t>::max();
  return right > 0 && left > kMost - right ? kMost : left + right;
}

std::string textOf(const Deviation &deviation) {
  const std::string name = rowOf(deviation.control).name;
  if (!deviation.actual) return "there is no " + name + ": its controller is not passed on";
  return name + " is " + *deviation.actual + ", not " + deviation.expected;
}

Held Bookkeeper::read(Group &group) const {
  const auto bytes = readAttribute(group.directory, kRecordAttribute);
  if (!bytes) return {readFiles(group), false, false};
  return fromAttribute(group, *bytes);
}

// What this process itself gave a new group need not be read back.
Held Bookkeeper::readToChange(Group &group) const {
  const auto bytes = readAttribute(group.directory, kRecordAttribute);
  if (bytes) return requireReadable(fromAttribute(group, *bytes));
  return {group.unrecordedMax ? newRecord(group) : readFiles(group), false, false};
}

void Bookkeeper::change(Group &group, Resource resource, const AllocationChange &change) {
  for (;;) {
    try {
      return changeHeld(group, readToChange(group), resource, change);
    } catch (const KernelError &error) {
      // Its maker, or that of a group above, has made its record just now; each makes one.
      if (error.status != Status::kExists) throw;
    }
  }
}

bool Bookkeeper::changeNew(Group &group, const AllocationChange &change) {
  const Record before = newRecord(group);
  Record after = before;
  after.cpu.allocation = changedAllocation(before.cpu.allocation, change);
  if (after.cpu.allocation.min != 0 || areEqual(after.cpu.allocation, before.cpu.allocation)) {
    return false;
  }
  try {
    writeRecord(group, after, Attribute::kNew);
  } catch (const KernelError &) {
    return false;
  }
  try {
    Writes writes(groups_);
    writeControls(writes, group, valuesOf(Resource::kCpu, before.cpu, facts_.cpus),
                  valuesOf(Resource::kCpu, after.cpu, facts_.cpus));
    writes.commit();
  } catch (const KernelError &) {
    takeBackCpu(group, after);
    throw;
  }
  const RecordBytes bytes = encode(after);
  if (readAttribute(group.directory, kRecordAttribute) !=
      std::string_view(bytes.data(), bytes.size())) {
    restoreCpu(group);
  }
  return true;
}

// Another process has changed the record while the files were written. What it says counts.
void Bookkeeper::restoreCpu(Group &group) {
  const GroupPtr top = groups_.openHost();
  const TreeLock lock(top->directory, TreeLock::Kind::kExclusive);
  const Held held = read(group);
  if (!held.isStored) return;
  for (const Value &value : valuesOf(Resource::kCpu, held.record.cpu, facts_.cpus)) {
    groups_.write(group, value.control, value.text);
  }
}

// The files could not be written; most often the group is gone.
void Bookkeeper::takeBackCpu(Group &group, const Record &made) noexcept {
  try {
    const GroupPtr top = groups_.openHost();
    const TreeLock lock(top->directory, TreeLock::Kind::kExclusive);
    Held held = read(group);
    if (!held.isStored || !areEqual(held.record.cpu.allocation, made.cpu.allocation)) return;
    held.record.cpu.allocation = {};
    writeRecord(group, held.record);
  } catch (const std::exception &) {
    // That leaves what a crash would leave, and check() finds it.
  }
}

void Bookkeeper::recordNew(Group &group) noexcept {
  if (group.unrecordedMax.value_or(-1) == -1) return;
  try {
    writeRecord(group, newRecord(group), Attribute::kNew);
  } catch (const std::exception &) {
    // Somebody else has made it, or the group is gone.
  }
}

void Bookkeeper::changeHeld(Group &group, Held held, Resource resource,
                            const AllocationChange &change) {
  const Allocation current = held.record.state(resource).allocation;
  const Allocation wanted = changedAllocation(current, change);
  if (held.record.savedHigh) restoreMemoryHigh(group, held.record);
  if (areEqual(wanted, current)) return groups_.requireAlive(group);
  if (resource == Resource::kCpu && count(group, held)) held = readToChange(group);
  apply(group, held, resource, wanted);
}

bool Bookkeeper::count(Group &group, const Held &held) {
  const Allocation &memory = held.record.memory.allocation;
  if (held.isStored || memory.min == 0) return false;
  apply(group, held, Resource::kMemory, memory);
  return true;
}

void Bookkeeper::apply(Group &group, const Held &held, Resource resource,
                       const Allocation &wanted) {
  const ResourceState &books = held.record.state(resource);
  // Without a record nothing above counts the group's minimum yet.
  const ResourceState own = {held.isStored ? books.allocation : Allocation(), books.childrenSum};
  const int64_t before = reservationOf(own);
  const int64_t after = reservationOf({wanted, own.childrenSum});
  if (after > before && after > machineCapacity(facts_, resource)) refuse("the machine");
  const std::vector<Place> above =
      before == after ? std::vector<Place>()
                      : placesFrom(groups_.parentOf(group), resource, before, after);
  const std::vector<ResourceState> levels = admitted(own, above, resource, wanted);

  Writes writes(groups_);
  if (resource == Resource::kMemory && isLower(wanted.max, books.allocation.max)) {
    makeRoomBelow(groups_, group, held, wanted.max, writes);
  }
  if (after < before) writeOwn(writes, group, held, resource, wanted);
  writeSums(writes, above, resource, levels);
  if (after >= before) writeOwn(writes, group, held, resource, wanted);
  writes.commit();
}

void Bookkeeper::releaseChild(Group &parent, const Held &child) {
  if (!child.isStored) return;
  for (Resource resource : {Resource::kMemory, Resource::kCpu}) {
    const ResourceState &books = child.record.state(resource);
    ResourceState own;
    own.allocation.min = reservationOf(books);
    if (own.allocation.min == 0) continue;
    const std::vector<Place> above =
        placesFrom(groups_.find(parent.id), resource, own.allocation.min, 0);
    Writes writes(groups_);
    writeSums(writes, above, resource, admitted(own, above, resource, Allocation()));
    writes.commit();
  }
}

std::vector<Deviation> Bookkeeper::deviations(Group &group, const Record &record) const {
  std::vector<Deviation> found = compare(group, record);
  if (found.empty()) return found;
  // Its maker may be about to write them.
  std::this_thread::sleep_for(kLongestWriting);
  return compare(group, record);
}

std::vector<Deviation> Bookkeeper::compare(Group &group, const Record &record) const {
  std::vector<Deviation> found;
  for (Resource resource : {Resource::kMemory, Resource::kCpu}) {
    for (const Value &value : valuesOf(resource, record.state(resource), facts_.cpus)) {
      auto actual = readControlIfAny(group.directory, rowOf(value.control).name);
      if (actual != value.text) found.push_back({value.control, value.text, std::move(actual)});
    }
  }
  return found;
}

// From a group up to the last one whose reservation can change.
std::vector<Bookkeeper::Place> Bookkeeper::placesFrom(GroupPtr group, Resource resource,
                                                      int64_t before, int64_t after) {
  std::vector<Place> places;
  for (; group; group = groups_.parentOf(*group)) {
    Held held = readToChange(*group);
    if (count(*group, held)) held = readToChange(*group);
    const ResourceState &books = held.record.state(resource);
    const int64_t sum = saturatedSum(books.childrenSum - before, after);
    places.push_back({group, held});
    if (books.allocation.min >= std::max(sum, books.childrenSum)) break;
    before = reservationOf(books);
    after = reservationOf({books.allocation, sum});
  }
  return places;
}

std::vector<ResourceState> Bookkeeper::admitted(const ResourceState &own,
                                                const std::vector<Place> &above, Resource resource,
                                                const Allocation &wanted) const {
  std::vector<ResourceState> levels = {own};
  for (const Place &place : above) {
    const ResourceState &books = place.held.record.state(resource);
    levels.push_back(books);
  }
  const auto answer = admit(std::move(levels), wanted, machineCapacity(facts_, resource));
  if (!answer) refuse("the group, one above it or the machine");
  return *answer;
}

// A directory takes records even when its group is gone; its files tell.
void Bookkeeper::writeControls(Writes &writes, Group &group, const Values &from,
                               const Values &to) const {
  bool isAlive = false;
  for (size_t i = 0; i < to.size(); ++i) {
    writes.control(group, to[i].control, from[i].text, to[i].text);
    isAlive = isAlive || from[i].text != to[i].text;
  }
  if (!isAlive) groups_.requireAlive(group);
}

void Bookkeeper::writeOwn(Writes &writes, Group &group, const Held &held, Resource resource,
                          const Allocation &wanted) const {
  const bool isNew = !held.isStored && group.unrecordedMax;
  Record after = held.record;
  after.state(resource).allocation = wanted;
  after.peaks = raisedPeaks(after.peaks, after.memory.allocation.min, after.memory.childrenSum);
  const Values to = valuesOf(resource, after.state(resource), facts_.cpus);
  Values from = valuesOf(resource, held.record.state(resource), facts_.cpus);
  if (isNew && resource == Resource::kMemory && isMaximumAlone(wanted)) {
    writeControls(writes, group, from, to);
    group.unrecordedMax = wanted.max;
    return;
  }
  writes.record(group, storedIn(held), after);
  if (!held.isStored && !isNew) {
    for (Value &value : from) value.text = readControl(group.directory, rowOf(value.control).name);
  }
  writeControls(writes, group, from, to);
}

// levels: what admission made of the group that changes, then of those places that change.
void Bookkeeper::writeSums(Writes &writes, const std::vector<Place> &above, Resource resource,
                           const std::vector<ResourceState> &levels) const {
  const size_t changed = levels.size() - 1;
  const auto writeSum = [&](size_t i) {
    const auto &[group, held] = above[i];
    Record after = held.record;
    after.state(resource).childrenSum = levels[i + 1].childrenSum;
    after.peaks = raisedPeaks(after.peaks, after.memory.allocation.min, after.memory.childrenSum);
    writes.record(*group, storedIn(held), after);
    // The first value is the one that the reservation shows in.
    const std::string from = valuesOf(resource, held.record.state(resource), facts_.cpus)[0].text;
    const Value to = valuesOf(resource, after.state(resource), facts_.cpus)[0];
    writes.control(*group, to.control, from, to.text);
  };
  if (changed == 0) return;
  const bool grows = levels[1].childrenSum > above[0].held.record.state(resource).childrenSum;
  for (size_t i = 0; i < changed; ++i) writeSum(grows ? changed - 1 - i : i);
}

}  // namespace Knob::Linux
