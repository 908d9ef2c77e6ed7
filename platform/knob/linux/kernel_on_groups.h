// SPDX-License-Identifier: Apache-2.0
// Each operation of the kernel interface on cgroup directories, under the lock on the tree where it
// changes or compares more than one thing; but for the first CPU settings of a new group.
#pragma once

#include <string_view>
#include <vector>

#include "knob/kernel.h"
#include "knob/linux/allocations.h"
#include "knob/linux/cgroup_tree.h"
#include "knob/linux/tree_lock.h"

namespace Knob::Linux {

class KernelOnGroups : public Kernel {
 public:
  KernelOnGroups(Hierarchy hierarchy, uint32_t maxVms);
  ~KernelOnGroups() override;
  KernelOnGroups(const KernelOnGroups &) = delete;
  KernelOnGroups &operator=(const KernelOnGroups &) = delete;

  GroupId lookUp(std::string_view path) override;
  GroupId create(GroupId parent, std::string_view name) override;
  void remove(GroupId id) override;
  Allocation readAllocation(GroupId id, Resource resource) override;
  void setAllocation(GroupId id, Resource resource, const AllocationChange &change) override;
  std::vector<GroupId> childGroups(GroupId id) override;
  std::vector<int64_t> members(GroupId id) override;
  void join(GroupId id, int64_t pid) override;
  MemoryStatistics memoryStatistics(GroupId id) override;
  HostFacts facts() override { return facts_; }
  BuildSignature signature() override;
  GroupView view(GroupId id) override;
  std::vector<Finding> check(bool repair) override;

 private:
  GroupPtr host();
  GroupPtr find(GroupId id);
  GroupId makeIn(const GroupPtr &parent, std::string_view name);
  void recordTheUnrecorded() noexcept;
  void changeAlone(const GroupPtr &group, Resource resource, const AllocationChange &change);
  void removeAgain(Group &group, Group &parent) noexcept;
  // Whether what this process saw of a maximum before is enough, or others may have changed it.
  enum class Seen { kCounts, kMayHaveChanged };
  void requireAnyMemory(GroupPtr group, Seen seen);

  Groups groups_;
  const HostFacts facts_;
  Bookkeeper books_;
  GroupPtr unrecorded_;  // a new group whose memory was set last, and whose record is still to come
};

}  // namespace Knob::Linux
