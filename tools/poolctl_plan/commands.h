// SPDX-License-Identifier: Apache-2.0
// The sub-commands of poolctl-plan.
#pragma once

#include "shared/tool.h"

namespace Plan {

void addCommands(CLI::App &app, Tools::Action *action);

}  // namespace Plan
