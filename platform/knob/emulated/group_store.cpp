// SPDX-License-Identifier: Apache-2.0
// SQL and the conversions between its integers and ours; nothing else.
#include "knob/emulated/group_store.h"

namespace Knob {
namespace {

using Platform::Query;
using Platform::Statement;

std::vector<Member> membersIn(Query &query) {
  std::vector<Member> members;
  while (query.step()) members.push_back({query.integer(0), query.integer(1), query.integer(2)});
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
  Query query(child_, parent, name);
  if (!query.step()) return std::nullopt;
  return query.integer(0);
}

bool GroupStore::exists(GroupId id) {
  return Query(exists_, id).step();
}

bool GroupStore::hasChildren(GroupId id) {
  return Query(children_, id).step();
}

std::vector<GroupId> GroupStore::children(GroupId id) {
  std::vector<GroupId> ids;
  Query query(children_, id);
  while (query.step()) ids.push_back(query.integer(0));
  return ids;
}

GroupId GroupStore::parentOf(GroupId id) {
  Query query(identity_, id);
  return query.step() ? query.integer(0) : 0;
}

std::string GroupStore::nameOf(GroupId id) {
  Query query(identity_, id);
  return query.step() ? query.text(1) : std::string();
}

GroupId GroupStore::add(GroupId parent, std::string_view name) {
  Query(add_, parent, name).finish();
  return database_.lastInsertId();
}

void GroupStore::remove(GroupId id) {
  Query(remove_, id).finish();
}

std::optional<ResourceRow> GroupStore::read(GroupId id, Resource resource) {
  Query query(of(resource).read, id);
  if (!query.step()) return std::nullopt;
  ResourceRow row;
  row.parent = query.integer(0);
  row.state.allocation = {query.integer(1), query.integer(2), query.integer(3), query.integer(4)};
  row.state.childrenSum = query.integer(5);
  row.peaks = {static_cast<uint64_t>(query.integer(6)), static_cast<uint64_t>(query.integer(7))};
  return row;
}

void GroupStore::writeAllocation(GroupId id, Resource resource, const Allocation &allocation) {
  Query(of(resource).writeAllocation, allocation.min, allocation.max, allocation.minLimit,
        allocation.shares, id)
      .finish();
}

void GroupStore::writeChildrenSum(GroupId id, Resource resource, int64_t sum) {
  Query(of(resource).writeChildrenSum, sum, id).finish();
}

void GroupStore::writePeaks(GroupId id, const MemoryStatistics &peaks) {
  Query(writePeaks_, static_cast<int64_t>(peaks.ownReservedPeakKB),
        static_cast<int64_t>(peaks.childrenReservedPeakKB), id)
      .finish();
}

std::vector<Member> GroupStore::membersOf(GroupId id) {
  Query query(membersOf_, id);
  return membersIn(query);
}

std::vector<Member> GroupStore::allMembers() {
  Query query(allMembers_);
  return membersIn(query);
}

void GroupStore::putMember(const Member &member) {
  Query(putMember_, member.pid, member.started, member.group).finish();
}

void GroupStore::removeMember(int64_t pid) {
  Query(removeMember_, pid).finish();
}

HostFacts GroupStore::facts(uint32_t defaultMaxVms) {
  HostFacts facts;
  Query query(facts_);
  if (!query.step()) throw KernelError(Status::kKernelNotUsable, "the state has no facts");
  facts.cpus = static_cast<uint32_t>(query.integer(0));
  facts.memoryKB = static_cast<uint64_t>(query.integer(1));
  facts.maxVms = query.isNull(2) ? defaultMaxVms : static_cast<uint32_t>(query.integer(2));
  facts.isVm = query.integer(3) != 0;
  facts.bootCommandLine = query.text(4);
  return facts;
}

BuildSignature GroupStore::signature() {
  Query query(signature_);
  if (!query.step()) throw KernelError(Status::kKernelNotUsable, "the state has no signature");
  return {query.text(0), query.text(1)};
}

}  // namespace Knob
