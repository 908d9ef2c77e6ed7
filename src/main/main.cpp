// SPDX-License-Identifier: Apache-2.0
// The process entry: checks that the kernel is the one this tool was built for, chooses the
// sub-command or the option mode, and is the one place that reports an escaping error.
#include <unistd.h>

#include <cstdlib>
#include <exception>
#include <iostream>
#include <string>
#include <string_view>

#include "commands/commands.h"
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
  std::cerr << "error: md5 signature mismatch with running nucleus built on " << runningBuild
            << ", my build date: " << myBuild << std::endl;
  exit(1);
}

const Command *findCommand(std::string_view name) {
  for (const Command &command : commandTable) {
    if (name == command.name) return &command;
  }
  return nullptr;
}

int reportUnknownCommand(const char *name) {
  std::cerr << "Unknown command " << name << std::endl;
  std::cerr << "Valid commands:";
  for (const Command &command : commandTable) std::cerr << " " << command.name;
  std::cerr << std::endl;
  return 1;
}

// getopt keeps a pointer into the last argument vector that it was given, so the vectors' texts
// outlive the calls.
void printGlobalHelp() {
  static char helpOption[] = "-h";
  for (const Command &command : commandTable) {
    std::string name = command.name;
    char *arguments[] = {name.data(), helpOption, nullptr};
    command.handler(2, arguments);
    optind = 1;
    std::cerr << std::endl;
  }
}

int dispatch(int argc, char **argv) {
  const Command *const command = findCommand(argv[1]);
  if (command == nullptr) return reportUnknownCommand(argv[1]);
  try {
    return command->handler(argc - 1, argv + 1);
  } catch (const std::exception &error) {
    std::cerr << error.what() << std::endl;
    return 1;
  }
}

}  // namespace

int main(int argc, char **argv) {
  requireMatchingKernel();
  if (argc >= 2 && argv[1][0] != '-') return dispatch(argc, argv);
  if (argc < 2 || std::string_view(argv[1]) == "-h") printGlobalHelp();
  return legacyMain(argc, argv);
}
