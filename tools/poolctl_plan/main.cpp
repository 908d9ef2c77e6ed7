// SPDX-License-Identifier: Apache-2.0
// poolctl-plan: checks definitions, compares them with the kernel, and makes the kernel match them.
#include "poolctl_plan/commands.h"
#include "shared/tool.h"

int main(int argc, char **argv) {
  return Tools::runTool(
      {"poolctl-plan", "Checks pool definitions, compares them with the kernel and applies them.",
       Plan::addCommands},
      argc, argv);
}
