// SPDX-License-Identifier: Apache-2.0
// A model of a kernel's groups, on which changes are tried before a kernel is asked. It uses the
// rules of libknob's kernels.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "knob/admission.h"
#include "knob/kernel.h"

namespace Plan {

// One group of a kernel.
struct KernelGroup {
  std::string path;
  Knob::GroupView view;
  size_t processes = 0;
};

// Every group of the kernel, parents first, siblings by name. A group that is deleted meanwhile is
// left out.
std::vector<KernelGroup> readGroups(Knob::Kernel &kernel);

// The path without its last component; empty for a path of one.
std::string parentOf(const std::string &path);

class PoolTree {
 public:
  // The two groups that always exist. memoryMB, cpuPercent: what the machine can give in all.
  PoolTree(int64_t memoryMB, int64_t cpuPercent);

  // The same with all groups of a kernel.
  PoolTree(int64_t memoryMB, int64_t cpuPercent, const std::vector<KernelGroup> &groups);

  bool has(const std::string &path) const { return groups_.count(path) > 0; }
  bool hasChildren(const std::string &path) const;
  const Knob::Allocation &allocation(const std::string &path, Knob::Resource resource) const;

  // Makes a group with default allocations. The parent must exist.
  void create(const std::string &path);

  // The group must have no children. What it reserves becomes free.
  void remove(const std::string &path);

  // Changes the group's allocation, or returns why the kernel would refuse it, with figures; then
  // nothing has changed.
  std::optional<std::string> set(const std::string &path, Knob::Resource resource,
                                 const Knob::AllocationChange &change);

 private:
  struct Group {
    Knob::ResourceState memory, cpu;
  };

  Knob::ResourceState &state(const std::string &path, Knob::Resource resource);
  const Knob::ResourceState &state(const std::string &path, Knob::Resource resource) const;
  void addToParents(const std::string &path);
  void apply(const std::string &path, Knob::Resource resource, const Knob::Allocation &wanted);
  std::string whyNoRoom(const std::string &path, Knob::Resource resource,
                        const Knob::Allocation &wanted) const;
  std::string holders(const std::string &parent, const std::string &except,
                      Knob::Resource resource) const;

  int64_t memoryMB_, cpuPercent_;
  std::map<std::string, Group> groups_;
};

}  // namespace Plan
