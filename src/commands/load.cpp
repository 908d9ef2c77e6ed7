// SPDX-License-Identifier: Apache-2.0
// Creates the enabled pools as kernel groups.
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
    "poolctl load [flags] [files...]\n"
    "    Create enabled resource pools defined in yaml files. If no yaml files\n"
    "    are specified, all files from /etc/rp.d will be used.\n"
    "Flags:\n"
    "    -q              Silence diagnostic messages.\n";

bool create(const Loader::ResourcePoolImpl &pool, bool quiet) {
  if (!pool.isEnabled) return false;
  try {
    Sched::createGroup(pool.name, pool.mem, pool.cpu);
  } catch (const Sched::Exception &failure) {
    if (failure.status != KNOB_STATUS_EXISTS) throw;
    if (!quiet) Console::printError(pool.name, " exists; skipping.");
    return false;
  }
  return true;
}

void load(const Loader::PoolList &pools, bool quiet) {
  const auto work = [quiet](const auto &pool) { return create(pool, quiet); };
  const auto undo = [](const auto &pool) { Sched::deleteGroup(Sched::pathNameToId(pool.name)); };
  Commands::runBatch(pools, {work, undo, "Failed to delete "});
}

}  // namespace

int cmdLoad(int argc, char **argv) {
  bool quiet = false;
  for (int option; (option = getopt(argc, argv, "hq")) != -1;) {
    if (option == 'q') {
      quiet = true;
      continue;
    }
    Console::printUsage(kUsage);
    return option == 'h' ? 0 : 1;
  }
  Commands::ignoreBrokenPipes();
  load(Loader::loadPools(operands(argc, argv), false), quiet);
  return 0;
}
