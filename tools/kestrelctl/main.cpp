// SPDX-License-Identifier: Apache-2.0
// kestrelctl: writes and shows the host configuration store.
#include "kestrelctl/commands.h"
#include "shared/tool.h"

int main(int argc, char **argv) {
  return Tools::runTool(
      {"kestrelctl", "Writes and shows the host configuration store.", Kestrelctl::addCommands},
      argc, argv);
}
