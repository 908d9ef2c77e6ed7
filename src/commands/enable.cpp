// SPDX-License-Identifier: Apache-2.0
// Restores disabled pools from their definitions in the definition folder.
#include <unistd.h>

#include <string>
#include <vector>

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
    "poolctl enable <rps...>\n"
    "    Enable disabled resource pools, which must be defined by files in\n"
    "    /etc/rp.d. A resource pools is considered disabled if it does not\n"
    "    exist or has its memory maximum set to 0. A non-existing pool\n"
    "    is enabled by getting created with settings from the yaml definition.\n"
    "    An existing pool has its memory allocation restored from the yaml\n"
    "    definition.\n";

// A group whose maximum is not 0 is enabled and is not changed.
void restoreMemory(const Loader::ResourcePoolImpl &pool) {
  const int64_t id = Sched::pathNameToId(pool.name);
  Sched::MemAllocation current;
  Sched::getMemAllocation(id, &current);
  if (current.max == 0 && pool.mem.max != 0) Sched::setMemAllocation(id, pool.mem);
}

void enable(const Loader::ResourcePoolImpl &pool) {
  try {
    restoreMemory(pool);
  } catch (const Sched::Exception &failure) {
    if (failure.status == KNOB_STATUS_NOT_FOUND) {
      Sched::createGroup(pool.name, pool.mem, pool.cpu);
    } else {
      Console::printError(pool.name, ": ", failure.what());
    }
  }
}

}  // namespace

int cmdEnable(int argc, char **argv) {
  const int option = getopt(argc, argv, "h");
  const std::vector<std::string> names = operands(argc, argv);
  if (option != -1 || names.empty()) {
    Console::printUsage(kUsage);
    return option == 'h' ? 0 : 1;
  }
  Commands::ignoreBrokenPipes();
  const Loader::PoolList pools = Loader::loadPools({}, false);
  Commands::StopSignals signals;
  for (const std::string &name : names) {
    enable(*Loader::findPool(name, pools));
    signals.endIfStopped();
  }
  return 0;
}
