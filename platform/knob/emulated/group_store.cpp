// SPDX-License-Identifier: Apache-2.0
// SQL and the conversions between its integers and ours; nothing else.
#include "knob/emulated/group_store.h"

namespace Knob {
namespace {

using Platform::Run;
using Platform::Statement;

std::vector<Member> membersIn(Run &run) {
  std::vector<Member> members;
  while (run.step()) members.push_back({run.integer(0), run.integer(1), run.integer(2)});
  return members;
}

}  // namespace

GroupStore::ResourceStatements::ResourceStatements(Platform::Database &database,
                                                   const std::string &prefix)
    : read(database, "SELECT parent, " + prefix + "_min, " + prefix + "_max, " + prefix +
                         "_limit, " + prefix + "_shares, " + prefix +
                         "_children, own_peak_kb, children_peak_kb FROM groups WHERE id = ?"),
      writeAllocation(database, "UPDATE groups SET " + prefix + "_min = ?, " + prefix +
                                    "_max = ?, " + prefix + "_limit = ?, " + prefix +
                                    "_shares = ? WHERE id = ?"),
      writeChildrenSum(database, "UPDATE groups SET " + prefix + "_children = ? WHERE id = ?") {}

GroupStore::GroupStore(Platform::Database &database)
    : database_(database),
      memory_(database, "mem"),
      cpu_(database, "cpu"),
      child_(database, "SELECT id FROM groups WHERE parent = ? AND name = ?"),
      exists_(database, "SELECT 1 FROM groups WHERE id = ?"),
      children_(database, "SELECT id FROM groups WHERE parent = ?"),
      identity_(database, "SELECT parent, name FROM groups WHERE id = ?"),
      add_(database, "INSERT INTO groups (parent, name) VALUES (?, ?)"),
      remove_(database, "DELETE FROM groups WHERE id = ?"),
      writePeaks_(database, "UPDATE groups SET own_peak_kb = ?, children_peak_kb = ? WHERE id = ?"),
      membersOf_(database, "SELECT pid, started, grp FROM members WHERE grp = ?"),
      allMembers_(database, "SELECT pid, started, grp FROM members"),
      putMember_(database, "INSERT OR REPLACE INTO members (pid, started, grp) VALUES (?, ?, ?)"),
      removeMember_(database, "DELETE FROM members WHERE pid = ?"),
      facts_(database, "SELECT cpus, memory_kb, max_vms, is_vm, command_line FROM kernel"),
      signature_(database, "SELECT md5, build_date FROM kernel") {}

std::optional<GroupId> GroupStore::child(GroupId parent, std::string_view name) {
  Run run(child_, parent, name);
  if (!run.step()) return std::nullopt;
  return run.integer(0);
}

bool GroupStore::exists(GroupId id) {
  return Run(exists_, id).step();
}

bool GroupStore::hasChildren(GroupId id) {
  return Run(children_, id).step();
}

std::vector<GroupId> GroupStore::children(GroupId id) {
  std::vector<GroupId> ids;
  Run run(children_, id);
  while (run.step()) ids.push_back(run.integer(0));
  return ids;
}

GroupId GroupStore::parentOf(GroupId id) {
  Run run(identity_, id);
  return run.step() ? run.integer(0) : 0;
}

std::string GroupStore::nameOf(GroupId id) {
  Run run(identity_, id);
  return run.step() ? run.text(1) : std::string();
}

GroupId GroupStore::add(GroupId parent, std::string_view name) {
  Run(add_, parent, name).finish();
  return database_.lastInsertId();
}

void GroupStore::remove(GroupId id) {
  Run(remove_, id).finish();
}

std::optional<ResourceRow> GroupStore::read(GroupId id, Resource resource) {
  Run run(of(resource).read, id);
  if (!run.step()) return std::nullopt;
  ResourceRow row;
  row.parent = run.integer(0);
  row.state.allocation = {run.integer(1), run.integer(2), run.integer(3), run.integer(4)};
  row.state.childrenSum = run.integer(5);
  row.peaks = {static_cast<uint64_t>(run.integer(6)), static_cast<uint64_t>(run.integer(7))};
  return row;
}

void GroupStore::writeAllocation(GroupId id, Resource resource, const Allocation &allocation) {
  Run(of(resource).writeAllocation, allocation.min, allocation.max, allocation.minLimit,
      allocation.shares, id)
      .finish();
}

void GroupStore::writeChildrenSum(GroupId id, Resource resource, int64_t sum) {
  Run(of(resource).writeChildrenSum, sum, id).finish();
}

void GroupStore::writePeaks(GroupId id, const MemoryStatistics &peaks) {
  Run(writePeaks_, static_cast<int64_t>(peaks.ownReservedPeakKB),
      static_cast<int64_t>(peaks.childrenReservedPeakKB), id)
      .finish();
}

std::vector<Member> GroupStore::membersOf(GroupId id) {
  Run run(membersOf_, id);
  return membersIn(run);
}

std::vector<Member> GroupStore::allMembers() {
  Run run(allMembers_);
  return membersIn(run);
}

void GroupStore::putMember(const Member &member) {
  Run(putMember_, member.pid, member.started, member.group).finish();
}

void GroupStore::removeMember(int64_t pid) {
  Run(removeMember_, pid).finish();
}

HostFacts GroupStore::facts(uint32_t defaultMaxVms) {
  HostFacts facts;
  Run run(facts_);
  if (!run.step()) throw KernelError(Status::kKernelNotUsable, "the state has no facts");
  facts.cpus = static_cast<uint32_t>(run.integer(0));
  facts.memoryKB = static_cast<uint64_t>(run.integer(1));
  facts.maxVms = run.isNull(2) ? defaultMaxVms : static_cast<uint32_t>(run.integer(2));
  facts.isVm = run.integer(3) != 0;
  facts.bootCommandLine = run.text(4);
  return facts;
}

BuildSignature GroupStore::signature() {
  Run run(signature_);
  if (!run.step()) throw KernelError(Status::kKernelNotUsable, "the state has no signature");
  return {run.text(0), run.text(1)};
}

}  // namespace Knob
