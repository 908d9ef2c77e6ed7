// SPDX-License-Identifier: Apache-2.0
// A tool's sub-commands as one table: the help, the parsing and the dispatch all walk it.
#pragma once

#include <CLI/App.hpp>
#include <memory>

#include "shared/tool.h"

namespace Tools {

// OPTIONS holds the options and operands of all the tool's sub-commands.
template <typename Options>
struct Command {
  const char *name;
  const char *help;
  void (*declare)(CLI::App &command, Options *options);
  ExitStatus (*run)(const Options &options);
};

// Adds every row of TABLE to APP. Parsing one sets *ACTION, which must live as long as APP.
template <typename Table>
void addCommands(CLI::App &app, const Table &table, Action *action) {
  app.require_subcommand(0, 1);  // runTool() reports a missing one
  for (const auto &row : table) addCommand(app, row, action);
}

template <typename Options>
void addCommand(CLI::App &app, const Command<Options> &row, Action *action) {
  CLI::App *command = app.add_subcommand(row.name, row.help);
  const auto options = std::make_shared<Options>();
  row.declare(*command, options.get());
  const auto run = row.run;
  command->callback([=] { *action = [=] { return run(*options); }; });
}

}  // namespace Tools
