// SPDX-License-Identifier: Apache-2.0
// What every tool does: reads the command line, runs the chosen action, and prints an error as
// "TOOL: what: why" on standard error. No other code prints errors.
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

// What a command line asks for, set by the tool or by a sub-command's callback. It runs once the
// whole line has been parsed.
using Action = std::function<ExitStatus()>;

struct Tool {
  const char *name;
  const char *description;
  // Adds the options and operands. The action lives as long as the app.
  void (*declareOptions)(CLI::App &app, Action *action);
};

// Parses the line, runs the action and returns the exit status. A line that sets no action is a
// usage error. Help and version go to standard output; output that cannot be written is a failure.
int runTool(const Tool &tool, int argc, char **argv) noexcept;

}  // namespace Tools
