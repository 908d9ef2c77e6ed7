// SPDX-License-Identifier: Apache-2.0
// Each operation of the kernel interface. One that changes something holds the lock on the tree
// from its first look at a group to its last write. Reading one group needs no lock: its record is
// one attribute, which Linux reads and writes whole.
#include "knob/linux/linux_kernel.h"

#include <fcntl.h>
#include <unistd.h>

#include <utility>

#include "knob/linux/allocations.h"
#include "knob/linux/check.h"
#include "knob/linux/control_values.h"
#include "knob/linux/fixed_groups.h"
#include "knob/linux/hierarchy.h"
#include "knob/linux/lowering.h"
#include "knob/linux/oom_score.h"
#include "knob/linux/tree_lock.h"
#include "knob/machine_facts.h"
#include "knob/names.h"

namespace Knob {
namespace Linux {
namespace {

HostFacts factsWith(uint32_t maxVms) {
  HostFacts facts = readMachineFacts();
  facts.maxVms = maxVms;
  return facts;
}

bool isFixed(const std::vector<std::string_view> &path) {
  return path.size() == 1 || (path.size() == 2 && path[1] == kFixedChildName);
}

[[noreturn]] void notFound(std::string_view path) {
  throw KernelError(Status::kNotFound, std::string(path));
}

GroupUsage usageOf(const Group &group) {
  GroupUsage usage;
  if (const auto bytes = readControlIfAny(group.fd(), kMemoryCurrentFile)) {
    usage.memoryBytes = parseLimit(*bytes);
  }
  if (const auto text = readControlIfAny(group.fd(), kCpuStatFile)) {
    usage.cpuMicroseconds = keyedValue(*text, "usage_usec");
  }
  return usage;
}

class LinuxKernel final : public Kernel {
 public:
  LinuxKernel(Hierarchy hierarchy, const Configuration &configuration)
      : tree_(std::move(hierarchy)),
        facts_(factsWith(configuration.maxVms)),
        allocations_(tree_, facts_, configuration.reserve) {}

  GroupId lookUp(std::string_view path) override {
    const auto components = splitPath(path);
    if (!components || components->front() != kRootName) notFound(path);
    GroupPtr group = tree_.lookUp(path);
    if (!group && isFixed(*components)) {
      makeFixedGroups(tree_);
      group = tree_.lookUp(path);
    }
    if (!group) notFound(path);
    return group->id;
  }

  GroupId create(GroupId parent, std::string_view name) override {
    if (!isGroupName(name)) throw KernelError(Status::kBadParameter, "not a name for a group");
    const TreeLock lock(host()->fd(), TreeLock::Kind::kExclusive);
    const GroupPtr above = find(parent);
    const GroupPtr group = make(above, name);
    try {
      allocations_.add(group, *above);
    } catch (const KernelError &) {
      removeQuietly(*group, *above);
      throw;
    }
    return group->id;
  }

  void remove(GroupId id) override {
    const TreeLock lock(host()->fd(), TreeLock::Kind::kExclusive);
    const GroupPtr group = find(id);
    if (isFixedGroup(tree_, *group)) {
      throw KernelError(Status::kPermissionDenied, "host and host/opt cannot be deleted");
    }
    allocations_.remove(*group, *tree_.parentOf(*group));
  }

  Allocation readAllocation(GroupId id, Resource resource) override {
    return readRecord(find(id)->fd()).record.state(resource).allocation;
  }

  void setAllocation(GroupId id, Resource resource, const AllocationChange &change) override {
    const TreeLock lock(host()->fd(), TreeLock::Kind::kExclusive);
    const GroupPtr group = find(id);
    allocations_.change(*group, resource, change);
  }

  std::vector<GroupId> childGroups(GroupId id) override {
    std::vector<GroupId> ids;
    for (const Child &child : readChildren(find(id)->fd())) ids.push_back(child.id);
    return ids;
  }

  std::vector<int64_t> members(GroupId id) override { return readMembers(find(id)->fd()); }

  void join(GroupId id, int64_t pid) override {
    const TreeLock lock(host()->fd(), TreeLock::Kind::kExclusive);
    const GroupPtr group = find(id);
    if (tree_.hasChildren(*group)) throw KernelError(Status::kBusy, "the group has child groups");
    // Linux would move the process, and kill it as soon as it needs a page.
    requireAnyMemory(group);
    const int former = oomScoreAdjFromUs(pid);
    tree_.addMember(*group, pid);
    (void)changeOomScoreAdj(pid, former, allocations_.oomScoreAdj(readRecord(group->fd()).record));
  }

  MemoryStatistics memoryStatistics(GroupId id) override {
    return readRecord(find(id)->fd()).record.peaks;
  }

  HostFacts facts() override { return facts_; }

  BuildSignature signature() override { return readSignature(tree_); }

  GroupView view(GroupId id) override;

  std::vector<Finding> check(bool repair) override {
    makeFixedGroups(tree_);
    const TreeLock lock(host()->fd(),
                        repair ? TreeLock::Kind::kExclusive : TreeLock::Kind::kShared);
    return checkTree(tree_, allocations_, repair);
  }

 private:
  GroupPtr host() {
    if (GroupPtr group = tree_.host()) return group;
    makeFixedGroups(tree_);
    if (GroupPtr group = tree_.host()) return group;
    noSuchGroup();
  }

  GroupPtr find(GroupId id) {
    GroupPtr group = tree_.find(id);
    tree_.requireAlive(*group);
    return group;
  }

  GroupPtr make(const GroupPtr &parent, std::string_view name) {
    try {
      return tree_.make(*parent, name);
    } catch (const KernelError &error) {
      if (error.status != Status::kOutOfMemory) throw;
    }
    const LiftedMaximum lifted(tree_, parent);
    return tree_.make(*parent, name);
  }

  // The group itself and all above it have a memory maximum other than 0.
  void requireAnyMemory(GroupPtr group) {
    for (; group; group = tree_.parentOf(*group)) {
      if (readControlIfAny(group->fd(), infoOf(Control::kMemoryMax).name) == "0") {
        throw KernelError(Status::kOutOfMemory,
                          "the memory maximum of " + tree_.nameOf(*group) + " is 0");
      }
    }
  }

  // The oom_score_adj that a process got when it joined the group that it is in now.
  int oomScoreAdjFromUs(int64_t pid) {
    if (readOomScoreAdj(pid).value_or(0) == 0) return 0;
    const GroupPtr group = tree_.groupOf(pid);
    return group ? allocations_.oomScoreAdj(readRecord(group->fd()).record) : 0;
  }

  // For a caller that reports an earlier error.
  void removeQuietly(Group &group, Group &parent) noexcept {
    try {
      tree_.remove(group, parent);
    } catch (const std::exception &) {
      // Another program has removed it or uses it.
    }
  }

  CgroupTree tree_;
  const HostFacts facts_;
  AllocationManager allocations_;
};

GroupView LinuxKernel::view(GroupId id) {
  const TreeLock lock(host()->fd(), TreeLock::Kind::kShared);
  const GroupPtr group = find(id);
  const StoredRecord stored = readRecord(group->fd());

  GroupView view;
  view.id = id;
  view.name = tree_.nameOf(*group);
  view.memory = stored.record.memory.allocation;
  view.cpu = stored.record.cpu.allocation;
  view.memoryReservationMB = reservationOf(stored.record.memory);
  view.cpuReservationPercent = reservationOf(stored.record.cpu);
  view.usage = usageOf(*group);
  if (stored.isDamaged) view.deviation = "its record cannot be read";
  if (stored.isStored) {
    const int64_t weight = allocations_.cpu().recordedWeight(*group, stored.record);
    for (const Deviation &deviation : allocations_.deviations(*group, stored.record, weight)) {
      view.deviation += (view.deviation.empty() ? "" : "; ") + textOf(deviation);
    }
  }
  return view;
}

// An error before there is a kernel means that there is none.
template <typename F>
auto beforeUse(const F &f) {
  try {
    return f();
  } catch (const KernelError &error) {
    throw KernelError(Status::kKernelNotUsable, error.what());
  }
}

// A group's files and its directory can have different owners.
bool mayMakeGroupsIn(int directory) {
  for (const char *name : {".", kSubtreeFile}) {
    if (::faccessat(directory, name, W_OK, AT_EACCESS) != 0) return false;
  }
  return true;
}

std::string accountLine(const Account &account, int64_t reserved) {
  const auto amount = [&](int64_t number) {
    return std::to_string(number) + " " + unitOf(account.resource);
  };
  return amount(account.total) + ": " + textOf(account) + "; " + amount(account.capacity()) +
         " for groups, which reserve " + amount(reserved);
}

LinuxHost lookAt(const Configuration &configuration) {
  CgroupTree tree(openHierarchy(configuration));
  LinuxHost result;
  result.path = tree.hierarchy().path;
  const GroupPtr host = tree.host();
  result.hasGroups = host != nullptr;

  if (!mayMakeGroupsIn(host ? host->fd() : tree.hierarchy().directory.get())) {
    result.problems.push_back("no right to make or change groups in " + result.path +
                              kHowToGetRights);
  }
  const Record record = host ? readRecord(host->fd()).record : Record();
  const int64_t promisedMB = reservationOf(record.memory);
  const HostFacts facts = factsWith(configuration.maxVms);
  for (const auto &[name, resource] :
       {std::pair("memory", Resource::kMemory), std::pair("CPU", Resource::kCpu)}) {
    const Account account = readAccount(resource, tree.hierarchy(), facts, configuration.reserve);
    result.account.emplace_back(name, accountLine(account, reservationOf(record.state(resource))));
  }
  if (!tree.hierarchy().protectsRecursively) {
    result.account.emplace_back("protection",
                                "a minimum protects no child groups beyond what they reserve: "
                                "cgroup2 is mounted without memory_recursiveprot");
  }
  if (!host) return result;
  for (std::string &text : unprotectedAbove(tree.hierarchy(), promisedMB)) {
    result.problems.push_back(std::move(text));
  }
  return result;
}

}  // namespace
}  // namespace Linux

std::unique_ptr<Kernel> openLinuxKernel(const Configuration &configuration) {
  return Linux::beforeUse([&] {
    return std::make_unique<Linux::LinuxKernel>(Linux::openHierarchy(configuration), configuration);
  });
}

LinuxHost lookAtLinuxHost(const Configuration &configuration) {
  return Linux::beforeUse([&] { return Linux::lookAt(configuration); });
}

}  // namespace Knob
