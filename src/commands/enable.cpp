// SPDX-License-Identifier: Apache-2.0
// Restores disabled pools from their definitions in the definition folder.
#include <unistd.h>

#include <iostream>
#include <string>
#include <vector>

#include "commands/commands.h"
#include "commands/operands.h"
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

// A group whose maximum is not 0 counts as enabled and is left as it is.
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
      std::cerr << pool.name << ": " << failure.what() << std::endl;
    }
  }
}

}  // namespace

int cmdEnable(int argc, char **argv) {
  const int option = getopt(argc, argv, "h");
  const std::vector<std::string> names = operands(argc, argv);
  if (option != -1 || names.empty()) {
    std::cerr << kUsage;
    return option == 'h' ? 0 : 1;
  }
  const Loader::PoolList pools = Loader::loadPools({}, false);
  for (const std::string &name : names) enable(*Loader::findPool(name, pools));
  return 0;
}
