// SPDX-License-Identifier: Apache-2.0
// Creates the enabled pools as kernel groups; a batch that fails is undone.
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
    "poolctl load [flags] [files...]\n"
    "    Create enabled resource pools defined in yaml files. If no yaml files\n"
    "    are specified, all files from /etc/rp.d will be used.\n"
    "Flags:\n"
    "    -q              Silence diagnostic messages.\n";

// Deletes the groups of this run, newest first. Its own failures are reported and do not stop it.
void undo(const Loader::PoolList &created) {
  for (auto pool = created.rbegin(); pool != created.rend(); ++pool) {
    try {
      Sched::deleteGroup(Sched::pathNameToId((*pool)->name));
    } catch (const Sched::Exception &failure) {
      std::cerr << "Failed to delete " << (*pool)->name << ": " << failure.what() << std::endl;
    }
  }
}

void load(const Loader::PoolList &pools, bool quiet) {
  Loader::PoolList created;
  for (const auto &pool : pools) {
    if (!pool->isEnabled) continue;
    try {
      Sched::createGroup(pool->name, pool->mem, pool->cpu);
    } catch (const Sched::Exception &failure) {
      if (failure.status != KNOB_STATUS_EXISTS) {
        undo(created);
        throw;
      }
      if (!quiet) std::cerr << pool->name << " exists; skipping." << std::endl;
      continue;
    }
    created.push_back(pool);
  }
}

}  // namespace

int cmdLoad(int argc, char **argv) {
  bool quiet = false;
  for (int option; (option = getopt(argc, argv, "hq")) != -1;) {
    if (option == 'q') {
      quiet = true;
      continue;
    }
    std::cerr << kUsage;
    return option == 'h' ? 0 : 1;
  }
  load(Loader::loadPools(operands(argc, argv), false), quiet);
  return 0;
}
