// SPDX-License-Identifier: Apache-2.0
// A kernel that records its calls and returns what the test wants.
#pragma once

#include <string>
#include <vector>

#include "knob/kernel.h"

namespace Knob {

class FakeKernel : public Kernel {
 public:
  std::vector<std::string> calls;
  Status answer = Status::kSuccess;  // another one is thrown
  HostFacts hostFacts;
  Allocation allocation;
  MemoryStatistics statistics;

  GroupId lookUp(std::string_view path) override {
    note("lookUp " + std::string(path));
    return 41;
  }
  GroupId create(GroupId parent, std::string_view name) override {
    note("create " + std::to_string(parent) + " " + std::string(name));
    return 42;
  }
  void remove(GroupId id) override { note("remove " + std::to_string(id)); }
  Allocation readAllocation(GroupId id, Resource resource) override {
    note("read " + std::to_string(id) + nameOf(resource));
    return allocation;
  }
  void setAllocation(GroupId id, Resource resource, const AllocationChange &change) override {
    note("set " + std::to_string(id) + nameOf(resource) + " min " +
         std::to_string(change.min.value_or(-99)));
  }
  std::vector<GroupId> childGroups(GroupId id) override {
    note("children " + std::to_string(id));
    return {7, 8, 9};
  }
  std::vector<int64_t> members(GroupId id) override {
    note("members " + std::to_string(id));
    return {1};
  }
  void join(GroupId id, int64_t pid) override {
    note("join " + std::to_string(id) + " " + std::to_string(pid));
  }
  MemoryStatistics memoryStatistics(GroupId id) override {
    note("statistics " + std::to_string(id));
    return statistics;
  }
  HostFacts facts() override {
    note("facts");
    return hostFacts;
  }
  BuildSignature signature() override { return {}; }
  GroupView view(GroupId) override { return {}; }
  std::vector<Finding> check(bool) override { return {}; }

 private:
  static std::string nameOf(Resource resource) {
    return resource == Resource::kMemory ? " memory" : " cpu";
  }
  void note(const std::string &call) {
    calls.push_back(call);
    if (answer != Status::kSuccess) throw KernelError(answer);
  }
};

}  // namespace Knob
