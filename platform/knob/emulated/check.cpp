// SPDX-License-Identifier: Apache-2.0
// Reads every group once, sums the reservations up from the leaves, and reports each stored sum
// that differs.
#include "knob/emulated/check.h"

#include <algorithm>
#include <map>
#include <utility>

#include "knob/admission.h"
#include "knob/emulated/group_store.h"
#include "knob/emulated/schema.h"
#include "knob/peaks.h"

namespace Knob {
namespace {

using Platform::Database;
using Platform::Query;
using Platform::Statement;

struct Group {
  GroupId parent = 0;
  std::string name, path;
  ResourceState memory, cpu;
  MemoryStatistics peaks;
};

class Checker {
 public:
  Checker(Database &database, std::string statePath, bool repair)
      : database_(database), store_(database), statePath_(std::move(statePath)), repair_(repair) {}

  std::vector<Finding> run() {
    // In a damaged file the other checks mean nothing.
    if (!checkFile()) return std::move(findings_);
    readGroups();
    order(kHostId, "");
    checkUnreachable();
    for (auto id = ordered_.rbegin(); id != ordered_.rend(); ++id) checkGroup(*id);
    checkMembers();
    return std::move(findings_);
  }

 private:
  bool checkFile() {
    Statement statement(database_, "PRAGMA quick_check(1)");
    Query query(statement);
    if (!query.step()) return true;
    const std::string result = query.text(0);
    if (result == "ok") return true;
    findings_.push_back({statePath_, "the state is damaged: " + result, false});
    return false;
  }

  void readGroups() {
    Statement statement(database_, "SELECT id, parent, name FROM groups");
    Query query(statement);
    while (query.step()) {
      Group group;
      group.parent = query.integer(1);
      group.name = query.text(2);
      const GroupId id = query.integer(0);
      group.memory = store_.read(id, Resource::kMemory)->state;
      group.cpu = store_.read(id, Resource::kCpu)->state;
      group.peaks = store_.read(id, Resource::kMemory)->peaks;
      if (id != kHostId) children_[group.parent].push_back(id);
      groups_.emplace(id, std::move(group));
    }
  }

  // Parents before their children, as far as host reaches.
  void order(GroupId root, const std::string &above) {
    if (groups_.find(root) == groups_.end()) return;
    groups_[root].path = above + groups_[root].name;
    ordered_.push_back(root);
    for (size_t next = ordered_.size() - 1; next < ordered_.size(); ++next) {
      const std::string folder = groups_[ordered_[next]].path + "/";
      for (GroupId id : children_[ordered_[next]]) {
        groups_[id].path = folder + groups_[id].name;
        ordered_.push_back(id);
      }
    }
  }

  void checkUnreachable() {
    for (const auto &[id, group] : groups_) {
      if (!group.path.empty()) continue;
      if (repair_) store_.remove(id);
      report(group.name, "group " + std::to_string(id) + " has no way up to host");
    }
  }

  void checkGroup(GroupId id) {
    Group &group = groups_[id];
    checkSum(id, Resource::kMemory, "memory", group.memory);
    checkSum(id, Resource::kCpu, "CPU", group.cpu);

    const MemoryStatistics raised =
        raisedPeaks(group.peaks, group.memory.allocation.min, group.memory.childrenSum);
    if (raised.ownReservedPeakKB == group.peaks.ownReservedPeakKB &&
        raised.childrenReservedPeakKB == group.peaks.childrenReservedPeakKB) {
      return;
    }
    if (repair_) store_.writePeaks(id, raised);
    report(group.path, "a peak is below what is reserved now");
  }

  void checkSum(GroupId id, Resource resource, const std::string &name, ResourceState &state) {
    int64_t sum = 0;
    for (GroupId child : children_[id]) {
      const Group &group = groups_[child];
      sum += reservationOf(resource == Resource::kMemory ? group.memory : group.cpu);
    }
    if (sum == state.childrenSum) return;
    if (repair_) store_.writeChildrenSum(id, resource, sum);
    report(groups_[id].path, "the children reserve " + std::to_string(sum) + " of " + name +
                                 ", the group counts " + std::to_string(state.childrenSum));
    state.childrenSum = sum;
  }

  void checkMembers() {
    for (const Member &member : store_.allMembers()) {
      const auto group = groups_.find(member.group);
      const bool known = group != groups_.end() && !group->second.path.empty();
      // A dead process is not a fault: the next write removes it.
      if (known) continue;
      if (repair_) store_.removeMember(member.pid);
      report(statePath_, "process " + std::to_string(member.pid) + " is in no group that exists");
    }
  }

  void report(const std::string &path, const std::string &text) {
    findings_.push_back({path, text, repair_});
  }

  Database &database_;
  GroupStore store_;
  const std::string statePath_;
  const bool repair_;
  std::map<GroupId, Group> groups_;
  std::map<GroupId, std::vector<GroupId>> children_;
  std::vector<GroupId> ordered_;
  std::vector<Finding> findings_;
};

}  // namespace

std::vector<Finding> checkState(Database &database, const std::string &path, bool repair) {
  return Checker(database, path, repair).run();
}

}  // namespace Knob
