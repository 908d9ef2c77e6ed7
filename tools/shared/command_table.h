// SPDX-License-Identifier: Apache-2.0
// A tool's sub-commands as one table: the help, the parsing and the dispatch all walk it.
#pragma once

#include <CLI/App.hpp>
#include <memory>

#include "shared/tool.h"

namespace Tools {

// WORDS holds what a line says, for all the tool's sub-commands.
template <typename Words>
struct Command {
  const char *name;
  const char *help;
  void (*declare)(CLI::App &command, Words *words);  // the words that it takes
  ExitStatus (*run)(const Words &words);
};

// Adds every row of TABLE to APP. Parsing one sets *ACTION, which must live as long as APP.
template <typename Table>
void addCommands(CLI::App &app, const Table &table, Action *action) {
  app.require_subcommand(0, 1);  // none at all is runTool()'s own usage error
  for (const auto &row : table) addCommand(app, row, action);
}

template <typename Words>
void addCommand(CLI::App &app, const Command<Words> &row, Action *action) {
  CLI::App *command = app.add_subcommand(row.name, row.help);
  const auto words = std::make_shared<Words>();
  row.declare(*command, words.get());
  const auto run = row.run;
  command->callback([=] { *action = [=] { return run(*words); }; });
}

}  // namespace Tools
