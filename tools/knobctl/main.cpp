// knobctl: looks at the kernel that libknob is configured for, and works on its groups by hand.
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>

#include "knobctl/commands.h"
#include "shared/tool.h"

int main(int argc, char **argv) {
  CLI::App app("Shows the configured kernel and works on its groups.", "knobctl");
  Tools::Action action;
  Knobctl::addCommands(app, &action);
  return Tools::runTool(app, argc, argv, action);
}
