// kestrelctl: writes and shows the host configuration store.
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>

#include "kestrelctl/commands.h"
#include "shared/tool.h"

int main(int argc, char **argv) {
  CLI::App app("Writes and shows the host configuration store.", "kestrelctl");
  Tools::Action action;
  Kestrelctl::addCommands(app, &action);
  return Tools::runTool(app, argc, argv, action);
}
