// SPDX-License-Identifier: Apache-2.0
// The frame of every tool: reads the command line, runs the chosen action, and is the one place
// that prints an error: "TOOL: what: why" on standard error.
#pragma once

#include <functional>
#include <stdexcept>
#include <string>

#include "shared/exit_status.h"

namespace CLI {
class App;
}

namespace Tools {

// Ends the tool with this status and message.
class Failure : public std::runtime_error {
 public:
  Failure(ExitStatus exitStatus, const std::string &message)
      : std::runtime_error(message), status(exitStatus) {}

  const ExitStatus status;
};

// What a command line asks for, set beforehand or by a sub-command's callback; it runs when the
// whole line has been found right.
using Action = std::function<ExitStatus()>;

struct Tool {
  const char *name;
  const char *description;
  void (*addWords)(CLI::App &app, Action *action);  // the action lives as long as the app
};

// Parses the line, runs the action and answers the exit status; a line that sets none is a usage
// error. Help goes to standard output; output that cannot be written is a
// failure.
int runTool(const Tool &tool, int argc, char **argv) noexcept;

}  // namespace Tools
