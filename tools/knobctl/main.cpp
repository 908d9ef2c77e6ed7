// SPDX-License-Identifier: Apache-2.0
// knobctl: looks at the kernel that libknob is configured for, and works on its groups by hand.
#include "knobctl/commands.h"
#include "shared/tool.h"

int main(int argc, char **argv) {
  return Tools::runTool(
      {"knobctl", "Shows the configured kernel and works on its groups.", Knobctl::addCommands},
      argc, argv);
}
