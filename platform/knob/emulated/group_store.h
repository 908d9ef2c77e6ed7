// SPDX-License-Identifier: Apache-2.0
// The rows of the emulated kernel's state: one function for each question and each change, inside a
// transaction of the caller. The rules of the kernel are elsewhere.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "common/sqlite.h"
#include "knob/admission.h"
#include "knob/kernel.h"

namespace Knob {

// A group's columns of one resource, and who is above it.
struct ResourceRow {
  GroupId parent = 0;
  ResourceState state;
  MemoryStatistics peaks;  // of memory, whatever the resource
};

struct Member {
  int64_t pid = 0;
  int64_t started = 0;
  GroupId group = 0;
};

class GroupStore {
 public:
  explicit GroupStore(Platform::Database &database);

  std::optional<GroupId> child(GroupId parent, std::string_view name);
  bool exists(GroupId id);
  bool hasChildren(GroupId id);
  std::vector<GroupId> children(GroupId id);
  GroupId parentOf(GroupId id);
  std::string nameOf(GroupId id);
  GroupId add(GroupId parent, std::string_view name);
  void remove(GroupId id);

  std::optional<ResourceRow> read(GroupId id, Resource resource);
  void writeAllocation(GroupId id, Resource resource, const Allocation &allocation);
  void writeChildrenSum(GroupId id, Resource resource, int64_t sum);
  void writePeaks(GroupId id, const MemoryStatistics &peaks);

  std::vector<Member> membersOf(GroupId id);
  std::vector<Member> allMembers();
  void putMember(const Member &member);
  void removeMember(int64_t pid);

  HostFacts facts(uint32_t defaultMaxVms);
  BuildSignature signature();

 private:
  struct ResourceStatements {
    ResourceStatements(Platform::Database &database, const std::string &prefix);
    Platform::Statement read, writeAllocation, writeChildrenSum;
  };
  ResourceStatements &of(Resource resource) {
    return resource == Resource::kMemory ? memory_ : cpu_;
  }

  Platform::Database &database_;
  ResourceStatements memory_, cpu_;
  Platform::Statement child_, exists_, children_, identity_, add_, remove_, writePeaks_;
  Platform::Statement membersOf_, allMembers_, putMember_, removeMember_;
  Platform::Statement facts_, signature_;
};

}  // namespace Knob
