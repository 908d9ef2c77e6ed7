// The operations. Each checks all that it needs, then changes all that it has to.
#include "knob/emulated/kernel_on_state.h"

#include <algorithm>
#include <optional>

#include "knob/admission.h"
#include "knob/allocation.h"
#include "knob/emulated/check.h"
#include "knob/emulated/emulated_kernel.h"
#include "knob/emulated/first_use.h"
#include "knob/emulated/processes.h"
#include "knob/emulated/schema.h"
#include "knob/names.h"
#include "knob/peaks.h"

namespace Knob {
namespace {

[[noreturn]] void notFound() {
  throw KernelError(Status::kNotFound);
}

bool lives(const Member &member) {
  return processStart(member.pid) == member.started;
}

std::vector<Member> onlyLiving(std::vector<Member> members) {
  members.erase(std::remove_if(members.begin(), members.end(),
                               [](const Member &member) { return !lives(member); }),
                members.end());
  return members;
}

uint64_t residentBytesOf(const std::vector<Member> &members) {
  uint64_t bytes = 0;
  for (const Member &member : members) bytes += residentBytes(member.pid);
  return bytes;
}

}  // namespace

KernelOnState::KernelOnState(const std::string &path, uint32_t maxVms)
    : path_(path),
      maxVms_(maxVms),
      database_(openState(path)),
      transactions_(database_),
      store_(database_) {}

template <typename F>
auto KernelOnState::alone(const F &operation) {
  try {
    return operation();
  } catch (const Platform::SqliteError &error) {
    throwStateError(path_, error);
  }
}

template <typename F>
auto KernelOnState::transact(Kind kind, const F &operation) {
  return alone([&] {
    Platform::Transaction transaction(transactions_, kind);
    if constexpr (std::is_void_v<decltype(operation())>) {
      operation();
      transaction.commit();
    } else {
      auto result = operation();
      transaction.commit();
      return result;
    }
  });
}

GroupId KernelOnState::lookUp(std::string_view path) {
  const auto components = splitPath(path);
  if (!components || components->front() != kRootName) notFound();

  const auto walk = [&] {
    GroupId id = kHostId;
    for (size_t i = 1; i < components->size(); ++i) {
      const auto child = store_.child(id, (*components)[i]);
      if (!child) notFound();
      id = *child;
    }
    return id;
  };
  // One step is one statement and needs no transaction around it.
  return components->size() <= 2 ? alone(walk) : transact(Kind::kRead, walk);
}

GroupId KernelOnState::create(GroupId parent, std::string_view name) {
  if (!isGroupName(name)) throw KernelError(Status::kBadParameter, "no name for a group");
  return transact(Kind::kWrite, [&] {
    if (!store_.exists(parent)) notFound();
    if (store_.child(parent, name)) throw KernelError(Status::kExists);
    if (!livingMembers(parent).empty()) {
      throw KernelError(Status::kBusy, "processes are in the parent group");
    }
    return store_.add(parent, name);
  });
}

void KernelOnState::remove(GroupId id) {
  if (id == kHostId || id == kOptId) {
    throw KernelError(Status::kPermissionDenied, "the group is there for good");
  }
  transact(Kind::kWrite, [&] {
    const ResourceRow memory = require(id, Resource::kMemory);
    const ResourceRow cpu = require(id, Resource::kCpu);
    if (store_.hasChildren(id)) throw KernelError(Status::kBusy, "child groups are in it");
    if (!livingMembers(id).empty()) throw KernelError(Status::kBusy, "processes are in it");
    reserve(id, Resource::kMemory, memory, Allocation());
    reserve(id, Resource::kCpu, cpu, Allocation());
    for (const Member &dead : store_.membersOf(id)) store_.removeMember(dead.pid);
    store_.remove(id);
  });
}

Allocation KernelOnState::readAllocation(GroupId id, Resource resource) {
  return alone([&] { return require(id, resource).level.allocation; });
}

void KernelOnState::setAllocation(GroupId id, Resource resource, const AllocationChange &change) {
  transact(Kind::kWrite, [&] {
    const ResourceRow row = require(id, resource);
    const Allocation wanted = changedAllocation(row.level.allocation, change);
    reserve(id, resource, row, wanted);
    if (resource == Resource::kMemory) {
      if (change.max && wanted.max != -1) requireMemoryFor(id, wanted.max);
      const MemoryStatistics peaks = raisedPeaks(row.peaks, wanted.min, row.level.childrenSum);
      if (peaks.ownReservedPeakKB != row.peaks.ownReservedPeakKB) store_.writePeaks(id, peaks);
    }
    store_.writeAllocation(id, resource, wanted);
  });
}

std::vector<GroupId> KernelOnState::childGroups(GroupId id) {
  return transact(Kind::kRead, [&] {
    std::vector<GroupId> children = store_.children(id);
    if (children.empty() && !store_.exists(id)) notFound();
    return children;
  });
}

std::vector<int64_t> KernelOnState::members(GroupId id) {
  return transact(Kind::kRead, [&] {
    if (!store_.exists(id)) notFound();
    std::vector<int64_t> pids;
    for (const Member &member : livingMembers(id)) pids.push_back(member.pid);
    return pids;
  });
}

void KernelOnState::join(GroupId id, int64_t pid) {
  transact(Kind::kWrite, [&] {
    if (!store_.exists(id)) notFound();
    if (store_.hasChildren(id)) throw KernelError(Status::kBusy, "child groups are in it");
    const auto started = processStart(pid);
    if (!started) throw KernelError(Status::kNotFound, "no living process of that id");
    // Here a write is due anyway, so that what is left of the dead goes with it.
    for (const Member &member : store_.membersOf(id)) {
      if (!lives(member)) store_.removeMember(member.pid);
    }
    store_.putMember({pid, *started, id});
  });
}

MemoryStatistics KernelOnState::memoryStatistics(GroupId id) {
  return alone([&] { return require(id, Resource::kMemory).peaks; });
}

HostFacts KernelOnState::facts() {
  return alone([&] { return store_.facts(maxVms_); });
}

BuildSignature KernelOnState::signature() {
  return alone([&] { return store_.signature(); });
}

GroupView KernelOnState::view(GroupId id) {
  return transact(Kind::kRead, [&] {
    const Level memory = require(id, Resource::kMemory).level;
    const Level cpu = require(id, Resource::kCpu).level;
    GroupView view;
    view.id = id;
    view.name = store_.nameOf(id);
    view.memory = memory.allocation;
    view.cpu = cpu.allocation;
    view.memoryReservationMB = reservationOf(memory);
    view.cpuReservationPercent = reservationOf(cpu);
    view.usage.memoryBytes = residentBytesOf(livingBelow(id));
    return view;
  });
}

std::vector<Finding> KernelOnState::check(bool repair) {
  return transact(repair ? Kind::kWrite : Kind::kRead,
                  [&] { return checkState(database_, path_, repair); });
}

ResourceRow KernelOnState::require(GroupId id, Resource resource) {
  const auto row = store_.read(id, resource);
  if (!row) notFound();
  return *row;
}

void KernelOnState::reserve(GroupId id, Resource resource, const ResourceRow &row,
                            const Allocation &wanted) {
  std::vector<Level> levels = {row.level};
  std::vector<GroupId> ids = {id};
  std::vector<MemoryStatistics> peaks = {row.peaks};

  // Where the group's own reservation stays, nothing above it can change.
  const bool changes = reservationOf({wanted, row.level.childrenSum}) != reservationOf(row.level);
  for (GroupId above = row.parent; changes && above != 0;) {
    const ResourceRow aboveRow = require(above, resource);
    levels.push_back(aboveRow.level);
    ids.push_back(above);
    peaks.push_back(aboveRow.peaks);
    above = aboveRow.parent;
  }

  const int64_t capacity = changes ? machineCapacity(store_.facts(maxVms_), resource) : 0;
  const auto admitted = admit(levels, wanted, capacity);
  if (!admitted) throw KernelError(Status::kReservationRefused);

  for (size_t i = 1; i < admitted->size(); ++i) {
    const Level &level = (*admitted)[i];
    store_.writeChildrenSum(ids[i], resource, level.childrenSum);
    if (resource == Resource::kMemory) {
      const auto raised = raisedPeaks(peaks[i], level.allocation.min, level.childrenSum);
      if (raised.childrenReservedPeakKB != peaks[i].childrenReservedPeakKB) {
        store_.writePeaks(ids[i], raised);
      }
    }
  }
}

std::vector<Member> KernelOnState::livingMembers(GroupId id) {
  return onlyLiving(store_.membersOf(id));
}

std::vector<Member> KernelOnState::livingBelow(GroupId id) {
  // A group has either children or processes of its own.
  if (!store_.hasChildren(id)) return livingMembers(id);
  std::vector<Member> members = onlyLiving(store_.allMembers());
  members.erase(std::remove_if(members.begin(), members.end(),
                               [&](const Member &member) { return !isBelow(member.group, id); }),
                members.end());
  return members;
}

bool KernelOnState::isBelow(GroupId id, GroupId ancestor) {
  while (id != 0 && id != ancestor) id = store_.parentOf(id);
  return id == ancestor;
}

void KernelOnState::requireMemoryFor(GroupId id, int64_t maxMB) {
  const uint64_t usedKB = residentBytesOf(livingBelow(id)) / 1024;
  if (usedKB > kilobytes(maxMB)) {
    throw KernelError(Status::kMemoryBusy,
                      "living processes use " + std::to_string(usedKB) + " KB");
  }
}

std::string emulatedStatePath(const Configuration &configuration) {
  return configuration.statePath ? *configuration.statePath : defaultStatePath();
}

std::unique_ptr<Kernel> openEmulatedKernel(const Configuration &configuration) {
  const std::string path = emulatedStatePath(configuration);
  if (!stateExists(path)) bootOnFirstUse(path);
  return std::make_unique<KernelOnState>(path, configuration.maxVms);
}

}  // namespace Knob
