// SPDX-License-Identifier: Apache-2.0
// Collects the facts of a boot and writes them into a new state or over the old one.
#include "knob/emulated/boot.h"

#include <ctime>

#include "knob/emulated/boot_record.h"
#include "knob/emulated/schema.h"
#include "knob/emulated/state_file.h"
#include "knob/machine_facts.h"
#include "knob/signature.h"

namespace Knob {
namespace {

using Platform::Database;
using Platform::Query;
using Platform::Statement;

constexpr size_t kMaxCommandLineBytes = 4095;

HostFacts factsToBootWith(const BootFacts &wanted) {
  constexpr uint64_t kMaxMB = UINT64_MAX / 1024;
  HostFacts facts = readMachineFacts();
  if (wanted.cpus) facts.cpus = *wanted.cpus;
  if (wanted.memoryMB && *wanted.memoryMB > kMaxMB) {
    throw KernelError(Status::kBadParameter, "more memory than can be counted in KB");
  }
  if (wanted.memoryMB) facts.memoryKB = *wanted.memoryMB * 1024;
  if (wanted.isVm) facts.isVm = *wanted.isVm;
  if (wanted.commandLine) facts.bootCommandLine = *wanted.commandLine;

  if (facts.cpus == 0) throw KernelError(Status::kBadParameter, "a machine has at least one CPU");
  if (facts.memoryKB == 0) throw KernelError(Status::kBadParameter, "a machine has some memory");
  if (facts.bootCommandLine.size() > kMaxCommandLineBytes) {
    if (wanted.commandLine) {
      throw KernelError(Status::kBadParameter, "a command line has at most 4095 bytes");
    }
    facts.bootCommandLine.resize(kMaxCommandLineBytes);
  }
  return facts;
}

BootRecord recordOf(const BootFacts &wanted) {
  return {factsToBootWith(wanted), wanted.maxVms, buildSignature()};
}

// Leaves the tree as it is right after a boot.
void writeBoot(Database &database, const BootRecord &record) {
  database.execute(kEmptyTree);
  Statement insert(database,
                   "INSERT INTO kernel (one, version, cpus, memory_kb, is_vm, command_line, md5, "
                   "build_date) VALUES (1, ?, ?, ?, ?, ?, ?, ?)");
  const HostFacts &facts = record.facts;
  // KB of 2^63 and more are kept as negative numbers and read back as what they were.
  Query(insert, kStateVersion, int64_t{facts.cpus}, static_cast<int64_t>(facts.memoryKB),
        facts.isVm ? 1 : 0, facts.bootCommandLine, record.signature.md5, record.signature.buildDate)
      .finish();
  if (!record.maxVms) return;
  Statement setMaxVms(database, "UPDATE kernel SET max_vms = ?");
  Query(setMaxVms, int64_t{*record.maxVms}).finish();
}

void refuseWhileGroupsExist(Database &database) {
  Statement statement(database, "SELECT COUNT(*) FROM groups WHERE id NOT IN (?, ?)");
  Query query(statement, kHostId, kOptId);
  if (query.step() && query.integer(0) > 0) {
    throw KernelError(Status::kBusy, "the kernel has " + std::to_string(query.integer(0)) +
                                         " groups; only force ends them");
  }
}

void rebootState(const std::string &path, const BootRecord &record, bool force) {
  Database database = openState(path);
  Platform::TransactionStatements statements(database);
  Platform::Transaction transaction(statements, Platform::Transaction::Kind::kWrite);
  if (!force) refuseWhileGroupsExist(database);
  removeBootRecord(path);
  writeBoot(database, record);
  transaction.commit();
  writeBootRecord(path, record);
}

// Ids that no process knows: those of the lost state are unknown, but they did not come
// faster than a thousand in a second.
void skipLostIds(Database &database) {
  Statement statement(database, "UPDATE sqlite_sequence SET seq = ? WHERE name = 'groups'");
  Query(statement, static_cast<int64_t>(std::time(nullptr)) * 1000).finish();
}

void makeState(const BootLock &lock, const std::string &path, const BootRecord &record,
               bool replacesLostOne) {
  removeBootRecord(path);
  buildState(lock, path, [&](Database &database) {
    writeBoot(database, record);
    if (replacesLostOne) skipLostIds(database);
  });
  writeBootRecord(path, record);
}

}  // namespace

void bootOnFirstUse(const std::string &path) {
  const BootLock lock(path);
  if (stateExists(path)) return;  // another process was faster
  try {
    makeState(lock, path, recordOf({}), false);
  } catch (const Platform::SqliteError &error) {
    throw KernelError(Status::kKernelNotUsable,
                      path + ": cannot make the state: " + std::string(error.what()));
  }
}

void bootEmulatedKernel(const Configuration &configuration, const BootFacts &wanted, bool force) {
  const BootRecord record = recordOf(wanted);
  const std::string path = emulatedStatePath(configuration);
  const BootLock lock(path);
  const bool exists = stateExists(path);
  try {
    if (exists) return rebootState(path, record, force);
  } catch (const KernelError &error) {
    if (error.status != Status::kKernelNotUsable || !force) throw;
  } catch (const Platform::SqliteError &error) {
    if (!force) throwStateError(path, error);
  }
  try {
    makeState(lock, path, record, exists);
  } catch (const Platform::SqliteError &error) {
    throwStateError(path, error);
  }
}

}  // namespace Knob
