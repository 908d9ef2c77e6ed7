// SPDX-License-Identifier: Apache-2.0
// Deletes the kernel groups of the declared pools, children first.
#include <unistd.h>

#include "commands/batch.h"
#include "commands/commands.h"
#include "commands/operands.h"
#include "commands/stop_signals.h"
#include "console/message.h"
#include "loader/definition_files.h"
#include "platform/knob_status.h"
#include "sched/exception.h"
#include "sched/scheduler_group.h"

namespace {

constexpr const char *kUsage =
    "poolctl unload [files...]\n"
    "    Delete resource pools defined in yaml files. If no yaml files are\n"
    "    specified, all files from /etc/rp.d will be used.\n";

// Replaces the settings of the definition by those of the live group, which an undo restores.
bool deletePool(Loader::ResourcePoolImpl &pool) {
  try {
    const int64_t id = Sched::pathNameToId(pool.name);
    Sched::getMemAllocation(id, &pool.mem);
    Sched::getCpuAllocation(id, &pool.cpu);
    Sched::deleteGroup(id);
  } catch (const Sched::Exception &failure) {
    if (failure.status != KNOB_STATUS_NOT_FOUND) throw;
    return false;
  }
  return true;
}

void recreate(const Loader::ResourcePoolImpl &pool) {
  Sched::createGroup(pool.name, pool.mem, pool.cpu);
}

}  // namespace

int cmdUnload(int argc, char **argv) {
  for (int option; (option = getopt(argc, argv, "h")) != -1;) {
    Console::printUsage(kUsage);
    return option == 'h' ? 0 : 1;
  }
  Commands::ignoreBrokenPipes();
  const Loader::PoolList pools = Loader::loadPools(operands(argc, argv), true);
  Commands::runBatch(pools, {deletePool, recreate, "Failed to recreate "});
  return 0;
}
