// SPDX-License-Identifier: Apache-2.0
// Sets the memory of the named groups to zero and deletes them. Waits for busy ones on request.
#include <unistd.h>

#include <cstdlib>
#include <ctime>
#include <iostream>
#include <string>
#include <vector>

#include "commands/commands.h"
#include "commands/operands.h"
#include "commands/stop_signals.h"
#include "console/message.h"
#include "console/result.h"
#include "platform/knob_status.h"
#include "sched/exception.h"
#include "sched/scheduler_group.h"

namespace {

constexpr const char *kUsage =
    "poolctl disable [flags] <rps...>\n"
    "    Disable and delete resource pools. A pool is disabled by having its\n"
    "    minimum and maximum memory allocation set to zero.\n"
    "Flags:\n"
    "    -w <seconds>    Optionally, wait upto <seconds> per resource pool,\n"
    "                    for it to become unused.\n"
    "    -n              Only disable, do not delete.\n";

constexpr useconds_t kRetryMicroseconds = 1000;

struct Options {
  bool deleteGroups = true;
  time_t deadlineSeconds = 0;  // of the wall clock, shared by all pools; 0: no waiting
};

void disableOnce(const std::string &name, const Options &options) {
  const int64_t id = Sched::pathNameToId(name);
  Sched::setMemAllocation(id, Sched::MemAllocation{});
  if (options.deleteGroups) Sched::deleteGroup(id);
}

bool isBusy(const Sched::Exception &failure) {
  return failure.status == KNOB_STATUS_MEMORY_BUSY || failure.status == KNOB_STATUS_BUSY;
}

// Returns false if the group is busy and the wait is not over.
bool tryDisable(const std::string &name, const Options &options) {
  try {
    disableOnce(name, options);
  } catch (const Sched::Exception &failure) {
    if (failure.status == KNOB_STATUS_NOT_FOUND) {
      std::cout << Console::resultText(name + ": " + failure.what()) << std::endl;
      return true;
    }
    if (isBusy(failure)) {
      if (options.deadlineSeconds < time(nullptr)) throw Sched::Exception(name, KNOB_STATUS_BUSY);
      return false;
    }
    // The entry point reports it a second time, without the name.
    Console::printError(name, ": ", failure.what());
    throw;
  }
  return true;
}

}  // namespace

int cmdDisable(int argc, char **argv) {
  Options options;
  for (int option; (option = getopt(argc, argv, "hnw:")) != -1;) {
    if (option == 'n') {
      options.deleteGroups = false;
    } else if (option == 'w') {
      options.deadlineSeconds = time(nullptr) + static_cast<int>(strtol(optarg, nullptr, 10));
    } else {
      Console::printUsage(kUsage);
      return option == 'h' ? 0 : 1;
    }
  }
  const std::vector<std::string> names = operands(argc, argv);
  if (names.empty()) {
    Console::printUsage(kUsage);
    return 1;
  }
  Commands::ignoreBrokenPipes();
  Commands::StopSignals signals;
  for (const std::string &name : names) {
    while (!tryDisable(name, options)) {
      usleep(kRetryMicroseconds);
      signals.endIfStopped();
    }
    signals.endIfStopped();
  }
  Console::flushResults();
  return 0;
}
