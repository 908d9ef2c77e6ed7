// SPDX-License-Identifier: Apache-2.0
// The operations. Each checks everything first and then makes all its changes.
#include "knob/emulated/emulated_kernel.h"

#include <algorithm>
#include <optional>

#include "common/process.h"
#include "knob/admission.h"
#include "knob/allocation.h"
#include "knob/emulated/boot.h"
#include "knob/emulated/boot_record.h"
#include "knob/emulated/check.h"
#include "knob/emulated/schema.h"
#include "knob/names.h"
#include "knob/peaks.h"

namespace Knob {
namespace {

[[noreturn]] void notFound(GroupId id) {
  throw KernelError(Status::kNotFound, "group " + std::to_string(id));
}

bool lives(const Member &member) {
  return Platform::processStart(member.pid) == member.started;
}

std::vector<Member> onlyLiving(std::vector<Member> members) {
  members.erase(std::remove_if(members.begin(), members.end(),
                               [](const Member &member) { return !lives(member); }),
                members.end());
  return members;
}

uint64_t residentBytesOf(const std::vector<Member> &members) {
  uint64_t bytes = 0;
  for (const Member &member : members) bytes += Platform::residentBytes(member.pid);
  return bytes;
}

}  // namespace

EmulatedKernel::State::State(const std::string &path)
    : database(openState(path)), transactions(database), store(database) {}

EmulatedKernel::EmulatedKernel(std::string path, uint32_t maxVms)
    : path_(std::move(path)), maxVms_(maxVms) {}

void EmulatedKernel::open() {
  if (!state_) state_ = std::make_unique<State>(path_);
}

template <typename F>
auto EmulatedKernel::alone(const F &operation) {
  open();
  try {
    return operation();
  } catch (const Platform::SqliteError &error) {
    throwStateError(path_, error);
  }
}

template <typename F>
auto EmulatedKernel::transact(Kind kind, const F &operation) {
  return alone([&] {
    Platform::Transaction transaction(state_->transactions, kind);
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

GroupId EmulatedKernel::lookUp(std::string_view path) {
  const auto components = splitPath(path);
  if (!components || components->front() != kRootName) {
    throw KernelError(Status::kNotFound, std::string(path));
  }
  const auto walk = [&] {
    GroupId id = kHostId;
    for (size_t i = 1; i < components->size(); ++i) {
      const std::string_view name = (*components)[i];
      const auto child = store().child(id, name);
      if (!child) {
        // The views point into the path.
        const auto length = static_cast<size_t>(name.data() + name.size() - path.data());
        throw KernelError(Status::kNotFound, std::string(path.substr(0, length)));
      }
      id = *child;
    }
    return id;
  };
  // One step is one statement and needs no transaction around it.
  return components->size() <= 2 ? alone(walk) : transact(Kind::kRead, walk);
}

GroupId EmulatedKernel::create(GroupId parent, std::string_view name) {
  if (!isGroupName(name))
    throw KernelError(Status::kBadParameter, "\"" + std::string(name) + "\" cannot name a group");
  return transact(Kind::kWrite, [&] {
    if (!store().exists(parent)) notFound(parent);
    if (store().child(parent, name)) throw KernelError(Status::kExists);
    if (!livingMembers(parent).empty()) {
      throw KernelError(Status::kBusy, "processes are in the parent group");
    }
    return store().add(parent, name);
  });
}

void EmulatedKernel::remove(GroupId id) {
  if (id == kHostId || id == kOptId) {
    throw KernelError(Status::kPermissionDenied, "host and host/opt cannot be deleted");
  }
  transact(Kind::kWrite, [&] {
    const ResourceRow memory = require(id, Resource::kMemory);
    const ResourceRow cpu = require(id, Resource::kCpu);
    if (store().hasChildren(id)) throw KernelError(Status::kBusy, "child groups are in it");
    if (!livingMembers(id).empty()) throw KernelError(Status::kBusy, "processes are in it");
    reserve(id, Resource::kMemory, memory, Allocation());
    reserve(id, Resource::kCpu, cpu, Allocation());
    for (const Member &dead : store().membersOf(id)) store().removeMember(dead.pid);
    store().remove(id);
  });
}

Allocation EmulatedKernel::readAllocation(GroupId id, Resource resource) {
  return alone([&] { return require(id, resource).state.allocation; });
}

void EmulatedKernel::setAllocation(GroupId id, Resource resource, const AllocationChange &change) {
  transact(Kind::kWrite, [&] {
    const ResourceRow row = require(id, resource);
    const Allocation wanted = changedAllocation(row.state.allocation, change);
    const bool disables = resource == Resource::kMemory && wanted.max == 0;
    if (disables && (id == kHostId || id == kOptId)) {
      throw KernelError(Status::kPermissionDenied, "host and host/opt cannot be disabled");
    }
    requireNoneReservedBelow(row.state, wanted);
    reserve(id, resource, row, wanted);
    if (resource == Resource::kMemory) {
      if (change.max && wanted.max != -1) requireMemoryFor(id, wanted.max);
      const MemoryStatistics peaks = raisedPeaks(row.peaks, wanted.min, row.state.childrenSum);
      if (peaks.ownReservedPeakKB != row.peaks.ownReservedPeakKB) store().writePeaks(id, peaks);
    }
    store().writeAllocation(id, resource, wanted);
  });
}

std::vector<GroupId> EmulatedKernel::childGroups(GroupId id) {
  return transact(Kind::kRead, [&] {
    std::vector<GroupId> children = store().children(id);
    if (children.empty() && !store().exists(id)) notFound(id);
    return children;
  });
}

std::vector<int64_t> EmulatedKernel::members(GroupId id) {
  return transact(Kind::kRead, [&] {
    if (!store().exists(id)) notFound(id);
    std::vector<int64_t> pids;
    for (const Member &member : livingMembers(id)) pids.push_back(member.pid);
    return pids;
  });
}

void EmulatedKernel::join(GroupId id, int64_t pid) {
  transact(Kind::kWrite, [&] {
    if (!store().exists(id)) notFound(id);
    if (store().hasChildren(id)) throw KernelError(Status::kBusy, "child groups are in it");
    requireAnyMemory(id);
    const auto started = Platform::processStart(pid);
    if (!started) throw KernelError(Status::kNotFound, "process " + std::to_string(pid));
    // This call writes anyway, so it also removes the dead members.
    for (const Member &member : store().membersOf(id)) {
      if (!lives(member)) store().removeMember(member.pid);
    }
    store().putMember({pid, *started, id});
  });
}

MemoryStatistics EmulatedKernel::memoryStatistics(GroupId id) {
  return alone([&] { return require(id, Resource::kMemory).peaks; });
}

HostFacts EmulatedKernel::facts() {
  if (!state_) {
    if (const auto record = readBootRecord(path_)) {
      HostFacts facts = record->facts;
      facts.maxVms = record->maxVms.value_or(maxVms_);
      return facts;
    }
  }
  return alone([&] { return store().facts(maxVms_); });
}

BuildSignature EmulatedKernel::signature() {
  if (!state_) {
    if (const auto record = readBootRecord(path_)) return record->signature;
  }
  return alone([&] { return store().signature(); });
}

GroupView EmulatedKernel::view(GroupId id) {
  return transact(Kind::kRead, [&] {
    const ResourceState memory = require(id, Resource::kMemory).state;
    const ResourceState cpu = require(id, Resource::kCpu).state;
    GroupView view;
    view.id = id;
    view.name = store().nameOf(id);
    view.memory = memory.allocation;
    view.cpu = cpu.allocation;
    view.memoryReservationMB = reservationOf(memory);
    view.cpuReservationPercent = reservationOf(cpu);
    view.usage.memoryBytes = residentBytesOf(livingBelow(id));
    return view;
  });
}

std::vector<Finding> EmulatedKernel::check(bool repair) {
  return transact(repair ? Kind::kWrite : Kind::kRead,
                  [&] { return checkState(state_->database, path_, repair); });
}

ResourceRow EmulatedKernel::require(GroupId id, Resource resource) {
  const auto row = store().read(id, resource);
  if (!row) notFound(id);
  return *row;
}

void EmulatedKernel::reserve(GroupId id, Resource resource, const ResourceRow &row,
                             const Allocation &wanted) {
  std::vector<ResourceState> states = {row.state};
  std::vector<GroupId> ids = {id};
  std::vector<MemoryStatistics> peaks = {row.peaks};

  // While the group's own reservation stays the same, nothing changes above it.
  const bool changes = reservationOf({wanted, row.state.childrenSum}) != reservationOf(row.state);
  for (GroupId above = row.parent; changes && above != 0;) {
    const ResourceRow aboveRow = require(above, resource);
    states.push_back(aboveRow.state);
    ids.push_back(above);
    peaks.push_back(aboveRow.peaks);
    above = aboveRow.parent;
  }

  const int64_t capacity = changes ? machineCapacity(store().facts(maxVms_), resource) : 0;
  const auto admitted = admit(states, wanted, capacity);
  if (!admitted) throw KernelError(Status::kReservationRefused);

  for (size_t i = 1; i < admitted->size(); ++i) {
    const ResourceState &state = (*admitted)[i];
    store().writeChildrenSum(ids[i], resource, state.childrenSum);
    if (resource == Resource::kMemory) {
      const auto raised = raisedPeaks(peaks[i], state.allocation.min, state.childrenSum);
      if (raised.childrenReservedPeakKB != peaks[i].childrenReservedPeakKB) {
        store().writePeaks(ids[i], raised);
      }
    }
  }
}

std::vector<Member> EmulatedKernel::livingMembers(GroupId id) {
  return onlyLiving(store().membersOf(id));
}

std::vector<Member> EmulatedKernel::livingBelow(GroupId id) {
  // A group has either children or processes of its own.
  if (!store().hasChildren(id)) return livingMembers(id);
  std::vector<Member> members = onlyLiving(store().allMembers());
  members.erase(std::remove_if(members.begin(), members.end(),
                               [&](const Member &member) { return !isBelow(member.group, id); }),
                members.end());
  return members;
}

bool EmulatedKernel::isBelow(GroupId id, GroupId ancestor) {
  while (id != 0 && id != ancestor) id = store().parentOf(id);
  return id == ancestor;
}

// A maximum of 0 leaves no memory for child groups and processes either.
void EmulatedKernel::requireAnyMemory(GroupId id) {
  for (ResourceRow row; id != 0; id = row.parent) {
    row = require(id, Resource::kMemory);
    if (row.state.allocation.max == 0) {
      throw KernelError(Status::kOutOfMemory, "the group, or one above it, may have no memory");
    }
  }
}

void EmulatedKernel::requireMemoryFor(GroupId id, int64_t maxMB) {
  const uint64_t usedKB = residentBytesOf(livingBelow(id)) / 1024;
  if (usedKB > kilobytes(maxMB)) {
    throw KernelError(Status::kMemoryBusy,
                      "living processes use " + std::to_string(usedKB) + " KB");
  }
}

std::unique_ptr<Kernel> openEmulatedKernel(const Configuration &configuration, Opening opening) {
  const std::string path = emulatedStatePath(configuration);
  if (!stateExists(path)) bootOnFirstUse(path);
  auto kernel = std::make_unique<EmulatedKernel>(path, configuration.maxVms);
  if (opening == Opening::kAtOnce) kernel->open();
  return kernel;
}

}  // namespace Knob
