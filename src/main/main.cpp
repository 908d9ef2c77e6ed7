// SPDX-License-Identifier: Apache-2.0
// The process entry: checks that the kernel is the one that this tool was built for, runs the
// sub-command or the option mode, and reports the exceptions that they throw.
#include <unistd.h>

#include <cstdlib>
#include <exception>
#include <string>
#include <string_view>

#include "commands/commands.h"
#include "console/message.h"
#include "console/standard_streams.h"
#include "platform/knob.h"

namespace {

struct Command {
  const char *name;
  CommandHandler handler;
};

// Users see this order: in the help and in the list of valid commands.
constexpr Command commandTable[] = {
    {"disable", cmdDisable}, {"unload", cmdUnload}, {"enable", cmdEnable},
    {"load", cmdLoad},       {"list", cmdList},
};

void requireMatchingKernel() {
  char runningBuild[21] = {};
  const char *myBuild = "";
  if (KNOB_CheckSig(runningBuild, sizeof runningBuild, &myBuild) == 0) return;
  Console::printError("error: md5 signature mismatch with running nucleus built on ", runningBuild,
                      ", my build date: ", myBuild);
  exit(1);
}

const Command *findCommand(std::string_view name) {
  for (const Command &command : commandTable) {
    if (name == command.name) return &command;
  }
  return nullptr;
}

int reportUnknownCommand(const char *name) {
  std::string valid = "Valid commands:";
  for (const Command &command : commandTable) valid += std::string(" ") + command.name;
  Console::printError("Unknown command ", name);
  Console::printError(valid);
  return 1;
}

// getopt keeps a pointer into the last option that it read and reads from there at the next call,
// so the option's text is static.
void printGlobalHelp() {
  static char helpOption[] = "-h";
  for (const Command &command : commandTable) {
    std::string name = command.name;
    char *arguments[] = {name.data(), helpOption, nullptr};
    command.handler(2, arguments);
    optind = 1;
    Console::printUsage("\n");
  }
}

int dispatch(int argc, char **argv) {
  const Command *const command = findCommand(argv[1]);
  if (command == nullptr) return reportUnknownCommand(argv[1]);
  return command->handler(argc - 1, argv + 1);
}

int run(int argc, char **argv) {
  requireMatchingKernel();
  if (argc >= 2 && argv[1][0] != '-') return dispatch(argc, argv);
  if (argc < 2 || std::string_view(argv[1]) == "-h") printGlobalHelp();
  return legacyMain(argc, argv);
}

}  // namespace

int main(int argc, char **argv) {
  Console::occupyClosedStreams();
  try {
    return run(argc, argv);
  } catch (const std::exception &error) {
    Console::printError(error.what());
    return 1;
  }
}
