// SPDX-License-Identifier: Apache-2.0
// Deletes the declared pools' kernel groups, children first; a batch that fails is undone.
#include <unistd.h>

#include <iostream>

#include "commands/commands.h"
#include "commands/operands.h"
#include "loader/definition_files.h"
#include "platform/knob_status.h"
#include "sched/exception.h"
#include "sched/scheduler_group.h"

namespace {

constexpr const char *kUsage =
    "poolctl unload [files...]\n"
    "    Delete resource pools defined in yaml files. If no yaml files are\n"
    "    specified, all files from /etc/rp.d will be used.\n";

// Makes the groups of this run again, newest first, as they were. Its own failures are reported
// and do not stop it.
void undo(const Loader::PoolList &deleted) {
  for (auto pool = deleted.rbegin(); pool != deleted.rend(); ++pool) {
    try {
      Sched::createGroup((*pool)->name, (*pool)->mem, (*pool)->cpu);
    } catch (const Sched::Exception &failure) {
      std::cerr << "Failed to recreate " << (*pool)->name << ": " << failure.what() << std::endl;
    }
  }
}

// The pool takes over the group's live settings, so that an undo restores these and not the
// definition's.
void deletePool(Loader::ResourcePoolImpl &pool) {
  const int64_t id = Sched::pathNameToId(pool.name);
  Sched::getMemAllocation(id, &pool.mem);
  Sched::getCpuAllocation(id, &pool.cpu);
  Sched::deleteGroup(id);
}

void unload(const Loader::PoolList &pools) {
  Loader::PoolList deleted;
  for (const auto &pool : pools) {
    try {
      deletePool(*pool);
    } catch (const Sched::Exception &failure) {
      if (failure.status == KNOB_STATUS_NOT_FOUND) continue;
      undo(deleted);
      throw;
    }
    deleted.push_back(pool);
  }
}

}  // namespace

int cmdUnload(int argc, char **argv) {
  for (int option; (option = getopt(argc, argv, "h")) != -1;) {
    std::cerr << kUsage;
    return option == 'h' ? 0 : 1;
  }
  unload(Loader::loadPools(operands(argc, argv), true));
  return 0;
}
