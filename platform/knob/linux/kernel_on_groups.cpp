// SPDX-License-Identifier: Apache-2.0
// Reading one group needs no lock: a record is one attribute, and Linux answers it whole. Of a
// group without one the files are read, one after the other.
#include "knob/linux/kernel_on_groups.h"

#include <utility>

#include "knob/linux/check.h"
#include "knob/linux/control_values.h"
#include "knob/linux/errno_status.h"
#include "knob/linux/fixed_groups.h"
#include "knob/linux/members.h"
#include "knob/machine_facts.h"
#include "knob/names.h"

namespace Knob::Linux {
namespace {

HostFacts factsWith(uint32_t maxVms) {
  HostFacts facts = readMachineFacts();
  facts.maxVms = maxVms;
  return facts;
}

bool isFixed(const std::vector<std::string_view> &path) {
  return path.size() == 1 || (path.size() == 2 && path[1] == kFixedChildName);
}

}  // namespace

KernelOnGroups::KernelOnGroups(Hierarchy hierarchy, uint32_t maxVms)
    : groups_(std::move(hierarchy)), facts_(factsWith(maxVms)), books_(groups_, facts_) {}

KernelOnGroups::~KernelOnGroups() {
  recordTheUnrecorded();
}

GroupId KernelOnGroups::lookUp(std::string_view path) {
  recordTheUnrecorded();
  const auto components = splitPath(path);
  if (!components || components->front() != kRootName) noSuchGroup();
  GroupPtr group = groups_.lookUp(path);
  if (!group && isFixed(*components)) {
    makeFixedGroups(groups_);
    group = groups_.lookUp(path);
  }
  if (!group) noSuchGroup();
  return group->id;
}

GroupId KernelOnGroups::create(GroupId parent, std::string_view name) {
  if (!isGroupName(name)) throw KernelError(Status::kBadParameter, "no name for a group");
  const GroupPtr above = find(parent);
  groups_.passOn(*above);
  try {
    return makeIn(above, name);
  } catch (const KernelError &) {
    // A group that got no child still takes processes.
    groups_.takeBack(*above);
    throw;
  }
}

GroupId KernelOnGroups::makeIn(const GroupPtr &parent, std::string_view name) {
  const GroupPtr group = groups_.make(*parent, name);
  try {
    // Linux itself refuses it most often, but not while it has some memory at hand.
    requireAnyMemory(parent, Seen::kCounts);
    // Another process may have taken the controllers back since this one has seen them passed on.
    // The file that shows it is the one that most pools set.
    (void)groups_.open(*group, Control::kMemoryMax);
  } catch (const KernelError &error) {
    // Removed by somebody at once; that does not undo that it was made.
    if (error.status == Status::kNotFound) return group->id;
    removeAgain(*group, *parent);
    throw;
  }
  return group->id;
}

// The first error counts.
void KernelOnGroups::removeAgain(Group &group, Group &parent) noexcept {
  try {
    groups_.remove(group, parent);
  } catch (const std::exception &) {
    // Somebody else has removed it or uses it already.
  }
}

void KernelOnGroups::remove(GroupId id) {
  const GroupPtr top = host();
  const TreeLock lock(top->directory, TreeLock::Kind::kExclusive);
  const GroupPtr group = find(id);
  const GroupPtr parent = groups_.parentOf(*group);
  if (!parent || (parent->id == top->id && groups_.nameOf(*group) == kFixedChildName)) {
    throw KernelError(Status::kPermissionDenied, "the group is there for good");
  }
  const Held held = books_.read(*group);
  groups_.remove(*group, *parent);
  books_.releaseChild(*parent, held);
  groups_.takeBack(*parent);
}

Allocation KernelOnGroups::readAllocation(GroupId id, Resource resource) {
  const GroupPtr group = find(id);
  const Held held = books_.read(*group);
  groups_.requireAlive(*group);  // a directory keeps its attributes when it is gone
  return held.record.state(resource).allocation;
}

void KernelOnGroups::setAllocation(GroupId id, Resource resource, const AllocationChange &change) {
  const GroupPtr group = groups_.find(id);
  // What was set under the lock just now has its controllers, and most likely no record yet.
  const bool isNew = group == unrecorded_ && group->unrecordedMax;
  if (group != unrecorded_) recordTheUnrecorded();
  try {
    if (isNew && resource == Resource::kCpu && books_.changeNew(*group, change)) return;
    changeAlone(group, resource, change);
  } catch (const KernelError &error) {
    // Whatever is asked of a group that is gone, it is not found.
    if (error.status == Status::kBadParameter) groups_.requireAlive(*group);
    throw;
  }
}

void KernelOnGroups::changeAlone(const GroupPtr &group, Resource resource,
                                 const AllocationChange &change) {
  const GroupPtr top = host();  // outlives the lock on its directory
  const TreeLock lock(top->directory, TreeLock::Kind::kExclusive);
  group->hasMemory = false;
  books_.change(*group, resource, change);
  if (group->unrecordedMax) unrecorded_ = group;
}

std::vector<GroupId> KernelOnGroups::childGroups(GroupId id) {
  std::vector<GroupId> ids;
  for (const Child &child : groups_.children(*find(id))) ids.push_back(child.id);
  return ids;
}

std::vector<int64_t> KernelOnGroups::members(GroupId id) {
  return readMembers(*find(id));
}

void KernelOnGroups::join(GroupId id, int64_t pid) {
  const GroupPtr top = host();
  const TreeLock lock(top->directory, TreeLock::Kind::kExclusive);
  const GroupPtr group = find(id);
  if (groups_.hasChildren(*group)) {
    groups_.requireAlive(*group);
    throw KernelError(Status::kBusy, "child groups are in it");
  }
  // Linux would take the process, and kill it as soon as it needs a page.
  requireAnyMemory(group, Seen::kMayHaveChanged);
  addMember(*group, pid);
}

// The group itself and all above it may have some memory.
void KernelOnGroups::requireAnyMemory(GroupPtr group, Seen seen) {
  for (; group; group = groups_.parentOf(*group)) {
    if (group->hasMemory && seen == Seen::kCounts) continue;
    const auto max = readControlIfAny(group->directory, rowOf(Control::kMemoryMax).name);
    group->hasMemory = max && max != "0";
    if (max == "0") {
      throw KernelError(Status::kOutOfMemory, "the group, or one above it, may have no memory");
    }
  }
}

MemoryStatistics KernelOnGroups::memoryStatistics(GroupId id) {
  const GroupPtr group = find(id);
  const Held held = books_.read(*group);
  groups_.requireAlive(*group);
  return held.record.peaks;
}

BuildSignature KernelOnGroups::signature() {
  return readSignature(groups_);
}

GroupView KernelOnGroups::view(GroupId id) {
  const GroupPtr top = host();
  const TreeLock lock(top->directory, TreeLock::Kind::kShared);
  const GroupPtr group = find(id);
  const Held held = books_.read(*group);
  groups_.requireAlive(*group);

  GroupView view;
  view.id = id;
  view.name = groups_.nameOf(*group);
  view.memory = held.record.memory.allocation;
  view.cpu = held.record.cpu.allocation;
  view.memoryReservationMB = reservationOf(held.record.memory);
  view.cpuReservationPercent = reservationOf(held.record.cpu);
  if (const auto bytes = readControlIfAny(group->directory, kMemoryCurrentFile)) {
    view.usage.memoryBytes = parseLimit(*bytes);
  }
  if (const auto text = readControlIfAny(group->directory, kCpuStatFile)) {
    view.usage.cpuMicroseconds = keyedValue(*text, "usage_usec");
  }
  if (held.isDamaged) {
    view.deviation = "its record cannot be read";
  } else if (held.isStored) {
    for (const Deviation &deviation : books_.deviations(*group, held.record)) {
      view.deviation += (view.deviation.empty() ? "" : "; ") + textOf(deviation);
    }
  }
  return view;
}

std::vector<Finding> KernelOnGroups::check(bool repair) {
  recordTheUnrecorded();
  makeFixedGroups(groups_);
  const GroupPtr top = host();
  const TreeLock lock(top->directory,
                      repair ? TreeLock::Kind::kExclusive : TreeLock::Kind::kShared);
  return checkTree(groups_, books_, facts_, repair);
}

GroupPtr KernelOnGroups::find(GroupId id) {
  recordTheUnrecorded();
  return groups_.find(id);
}

// Most often the next call sets the group's CPU, and makes the record in passing.
void KernelOnGroups::recordTheUnrecorded() noexcept {
  if (const GroupPtr group = std::exchange(unrecorded_, nullptr)) books_.recordNew(*group);
}

// Every id that a caller can have came from a look-up below it, so it is there.
GroupPtr KernelOnGroups::host() {
  if (GroupPtr group = groups_.openHost()) return group;
  makeFixedGroups(groups_);
  if (GroupPtr group = groups_.host()) return group;
  noSuchGroup();
}

}  // namespace Knob::Linux
